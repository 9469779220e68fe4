#include "fuzz/treekinds.h"
#include "host/session.h"
#include "tests/hostile/samples.h"
#include "tests/support/places.h"
#include "tests/support/reports.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>

// Fuzzing begins with the samples: they lie in fuzz/corpus, each in its target's folder. With KFS_WRITE_SEEDS set to
// that folder they are written there instead of being looked for.

namespace {

std::filesystem::path const Corpus = kfstest::SourceFolder() / "fuzz/corpus";

class Seeds : public testing::Test {
protected:
    static void Check(std::string const& target, std::vector<Sample> const& samples)
    {
        char const* const folder = std::getenv("KFS_WRITE_SEEDS");
        for (Sample const& sample : samples) {
            std::filesystem::path const file = std::filesystem::path(target) / sample.name;
            if (folder) {
                std::filesystem::create_directories((folder / file).parent_path());
                std::ofstream(folder / file, std::ios::binary) << sample.bytes;
            } else {
                EXPECT_TRUE(std::filesystem::is_regular_file(Corpus / file)) << file << " isn't in the corpus";
            }
        }
    }

    kfshost::Session session_;
    ReportRecorder reports_;
};

TEST_F(Seeds, EachSampleIsInTheCorpus)
{
    Check("project", ProjectSamples());
    {
        fuzzkinds::TreeKinds const kinds;
        Check("tree", TreeSamples());
    }
    Check("gltf", GltfSamples());
    Check("bvh", BvhSamples());
}

}  // namespace
