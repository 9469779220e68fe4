#include "tree/matchname.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstring>
#include <thread>
#include <vector>

namespace {

char const* Text(KFS_MatchName const& name)
{
    return reinterpret_cast<char const*>(name.GetName());
}

TEST(MatchName, TextGoesInAndComesBackOut)
{
    const KFS_MatchName position("position", true);
    EXPECT_TRUE(position.IsValid());
    EXPECT_STREQ("position", Text(position));
    EXPECT_EQ(position, KFS_MatchName("position", false));
    EXPECT_EQ(position.GetName(), KFS_MatchName("position", false).GetName()) << "one entry for a text";
    EXPECT_NE(position, KFS_MatchName("Position", true));
    KFS_MatchName other;
    other = "position";
    EXPECT_EQ(position, other);
}

// The hash of a text is the same in every process: MurmurHash3 x64 128 of all its bytes, also of those that the pool
// doesn't keep.
TEST(MatchName, HashIsOfTheWholeText)
{
    const KFS_MatchName empty("", true);
    EXPECT_FALSE(empty.IsValid()) << "the hash of no bytes is all zero, like a name that was never set";
    EXPECT_EQ(empty, KFS_MatchName(static_cast<char const*>(nullptr), true));
    // h1 and h2 of a well-known vector
    hearth::utility::Guid const published(
        {0x6c, 0x1b, 0x07, 0xbc, 0x7b, 0xbc, 0x4b, 0xe3, 0x47, 0x93, 0x9a, 0xc4, 0xa9, 0x3c, 0x43, 0x7a});
    EXPECT_TRUE(published == KFS_MatchName("The quick brown fox jumps over the lazy dog", true).GetGuid());
    std::string const common(45, 'x');
    EXPECT_NE(KFS_MatchName((common + "1").c_str(), true), KFS_MatchName((common + "2").c_str(), true));
}

TEST(MatchName, LongTextsKeepWhatFitsTheirPlace)
{
    for (std::size_t const length : {39u, 60u})
        EXPECT_EQ(std::string(39, 'k'), Text(KFS_MatchName(std::string(length, 'k').c_str(), true)));
}

TEST(MatchName, UnsetAndForeignHashesAndTheEndOfAGroup)
{
    EXPECT_FALSE(KFS_MatchName().IsValid());
    EXPECT_EQ(KFS_MatchName(), KFS_MatchName());
    KFS_MatchName foreign;
    foreign.SetGuid(hearth::utility::Guid({1, 2, 3}));
    EXPECT_TRUE(foreign.IsValid());
    EXPECT_EQ(nullptr, foreign.GetName());
    EXPECT_TRUE(KFS_MatchName("ZQVM Group End", true).IsEndOfGroupMarker());
    EXPECT_FALSE(KFS_MatchName("ZQVM Group End ", true).IsEndOfGroupMarker());
    EXPECT_FALSE(KFS_MatchName().IsEndOfGroupMarker());
}

TEST(MatchNameThreads, ManyThreadsInternOneEntryAText)
{
    constexpr int Texts = 200;
    std::vector<unsigned char const*> first(Texts);
    std::atomic<int> differing{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) {
        threads.emplace_back([&, t] {
            for (int i = 0; i < Texts; ++i) {
                const std::string text = "interned at once " + std::to_string(i);
                KFS_MatchName const name(text.c_str(), true);
                differing += text != Text(name);
                if (t == 0) first[static_cast<std::size_t>(i)] = name.GetName();
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(0, differing);
    for (int i = 0; i < Texts; ++i) {
        EXPECT_EQ(first[static_cast<std::size_t>(i)],
                  KFS_MatchName(("interned at once " + std::to_string(i)).c_str(), true).GetName());
    }
}

}  // namespace
