#include "tree/matchname.h"

#include <gtest/gtest.h>

#include <atomic>
#include <set>
#include <thread>
#include <vector>

namespace {

using hearth::utility::Guid;

char const* Text(KFS_MatchName const& name)
{
    return reinterpret_cast<char const*>(name.GetName());
}

// The hash of a text is the same in every process: MurmurHash3 x64 128 of all its bytes, also of those that the pool
// doesn't keep.
TEST(MatchName, TextsComeBackAndTheirHashIsOfAllOfThem)
{
    std::set<KFS_MatchName> names;
    std::string const common(45, 'x');
    std::string const texts[] = {"position", "Position", std::string(39, 'k'), common, common + "1", common + "2"};
    for (std::string const& text : texts) {
        KFS_MatchName const name(text.c_str(), true);
        EXPECT_TRUE(name.IsValid() && names.insert(name).second);
        EXPECT_EQ(text.substr(0, 39), Text(name));
        KFS_MatchName other;
        other = text.c_str();
        EXPECT_EQ(name, other);
        EXPECT_EQ(name.GetName(), other.GetName()) << "one entry for a text";
    }
    // h1 and h2 of a well-known vector
    EXPECT_TRUE(Guid({0x6c, 0x1b, 0x07, 0xbc, 0x7b, 0xbc, 0x4b, 0xe3, 0x47, 0x93, 0x9a, 0xc4, 0xa9, 0x3c, 0x43,
                      0x7a}) == KFS_MatchName("The quick brown fox jumps over the lazy dog", true).GetGuid());
    EXPECT_EQ(KFS_MatchName(), KFS_MatchName("", true)) << "the hash of no bytes is all zero, like a name never set";
    EXPECT_EQ(KFS_MatchName(), KFS_MatchName(static_cast<char const*>(nullptr), true));
    EXPECT_FALSE(KFS_MatchName().IsValid());
    KFS_MatchName foreign;
    foreign.SetGuid(Guid({1, 2, 3}));
    EXPECT_TRUE(foreign.IsValid() && !foreign.GetName());
    EXPECT_FALSE(KFS_MatchName("ZQVM Group End ", true).IsEndOfGroupMarker());
}

TEST(MatchName, ManyThreadsInternOneEntryAText)
{
    std::vector<std::set<char const*>> entries(200);
    std::atomic<std::size_t> turn{0};
    std::vector<std::thread> threads;
    for (std::size_t t = 0; t < 4; ++t) {
        threads.emplace_back([&, t] {
            std::vector<char const*> mine;
            for (std::size_t i = 0; i < entries.size(); ++i)
                mine.push_back(Text(KFS_MatchName(("interned at once " + std::to_string(i)).c_str(), true)));
            while (turn != t) std::this_thread::yield();
            for (std::size_t i = 0; i < entries.size(); ++i) entries[i].insert(mine[i]);
            ++turn;
        });
    }
    for (std::thread& thread : threads) thread.join();
    for (std::size_t i = 0; i < entries.size(); ++i) {
        ASSERT_EQ(1u, entries[i].size());
        EXPECT_EQ("interned at once " + std::to_string(i), *entries[i].begin());
    }
}

}  // namespace
