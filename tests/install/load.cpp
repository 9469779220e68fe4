// Loads libkfs late, as Python and hosts of plug-ins do, and with what others left of the process: behind libraries that
// used up the room for static thread-local data, and beside services that aren't its own.
//
//     test_load libkfs.so [filler.so]
#include <dlfcn.h>
#include <stdlib.h>

#include <cstdio>
#include <filesystem>
#include <string>

#ifdef OTHER_SERVICES
// The mark of services of another make, which libkfs meets before its own.
extern "C" __attribute__((visibility("default"))) unsigned const Qp_ServicesStamp = 0;
constexpr int ExpectedBirth = 7447;
#else
constexpr int ExpectedBirth = 0;
#endif

namespace {

// Copies of the filler are loaded until no more fit, and one is given back: room for one filler, and no second.
bool UseUpStaticTls(std::string const& filler)
{
    std::string folder = (std::filesystem::temp_directory_path() / "kfs_load_XXXXXX").string();
    if (!mkdtemp(folder.data())) return false;
    void* last = nullptr;
    int loaded = 0;
    for (; loaded < 1000; ++loaded) {
        std::string const copy = folder + "/filler" + std::to_string(loaded) + ".so";
        std::filesystem::copy_file(filler, copy);
        void* const library = dlopen(copy.c_str(), RTLD_NOW);
        if (!library) break;
        last = library;
    }
    std::filesystem::remove_all(folder);
    std::printf("%d fillers\n", loaded);
    return last && loaded < 1000 && dlclose(last) == 0;
}

int Fail(char const* what)
{
    std::fprintf(stderr, "%s: %s\n", what, dlerror());
    return 1;
}

}  // namespace

int main(int argc, char** argv)
{
    if (argc < 2) return 2;
    if (argc > 2 && !UseUpStaticTls(argv[2])) return Fail("no fillers");
    void* const library = dlopen(argv[1], RTLD_NOW);
    if (!library) return Fail("libkfs isn't loaded");
    auto const birth = reinterpret_cast<int (*)()>(dlsym(library, "_Z9KFS_Birthv"));
    auto const death = reinterpret_cast<int (*)()>(dlsym(library, "_Z9KFS_Deathv"));
    if (!birth || !death) return Fail("libkfs has no start");
    int const born = birth();
    int const died = death();
    std::printf("KFS_Birth %d, KFS_Death %d\n", born, died);
    return born == ExpectedBirth && died == 0 ? 0 : 1;
}
