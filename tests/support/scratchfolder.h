#pragma once

#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>
#include <stdexcept>
#include <string>
#include <system_error>

#include <stdlib.h>

// The bytes of a file; none where it can't be read.
inline std::string FileContent(std::string const& fileName)
{
    std::ifstream file(fileName, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

// A folder of its own for one test, which goes away with its content.
class ScratchFolder {
public:
    ScratchFolder()
    {
        std::string pattern = (std::filesystem::temp_directory_path() / "kfs_test_XXXXXX").string();
        if (!mkdtemp(pattern.data())) throw std::runtime_error("no folder for the test");
        path_ = pattern;
    }
    ~ScratchFolder()
    {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    ScratchFolder(ScratchFolder const&) = delete;
    ScratchFolder& operator=(ScratchFolder const&) = delete;

    std::string Path(std::string const& name) const { return (path_ / name).string(); }
    // Makes a file, and the folders in which it is to be. Returns its path.
    std::string Write(std::string const& name, std::string const& bytes) const
    {
        std::filesystem::create_directories((path_ / name).parent_path());
        std::filesystem::remove(path_ / name);  // overwriting a file waits for the disk, a new one doesn't
        std::ofstream(path_ / name, std::ios::binary) << bytes;
        return Path(name);
    }
    // What is in it, sub-folders' content left out.
    std::set<std::string> Names() const
    {
        std::set<std::string> names;
        for (std::filesystem::directory_entry const& entry : std::filesystem::directory_iterator(path_))
            names.insert(entry.path().filename().string());
        return names;
    }

private:
    std::filesystem::path path_;
};
