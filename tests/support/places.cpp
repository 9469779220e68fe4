// Apart from the tests because it alone knows paths of this build.
#include "tests/support/places.h"

namespace kfstest {

std::filesystem::path DataFolder()
{
    return KFS_TEST_DATA;
}

std::filesystem::path SamplesFolder()
{
    return SourceFolder() / "examples" / "samples";
}

std::filesystem::path SourceFolder()
{
    return KFS_TEST_SOURCE;
}

char const* Command()
{
#ifdef KFS_TEST_COMMAND
    return KFS_TEST_COMMAND;
#else
    return nullptr;
#endif
}

}  // namespace kfstest
