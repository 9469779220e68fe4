#include "tree/streampath.h"

#include "frame/boundary_private.h"
#include "frame/frame.h"
#include "frame/services/anyvalue.h"
#include "host/session.h"
#include "tests/support/chunklines.h"
#include "tests/support/dice.h"
#include "tests/support/reports.h"
#include "tests/support/text.h"

#include <deque>

// Identifiers and paths against the plainest form of their rules, on all short paths of a few identifiers.

namespace {

using ID = KFS_StreamID;
using Path = KFS_StreamIDPath;
using IDs = std::vector<ID>;

KFS_MatchName Name(char const* text)
{
    return KFS_MatchName(text, true);
}

// By index where both have one, else by name, else not at all.
template <class Compare>
bool Compared(ID const& a, ID const& b, Compare const& compare)
{
    if (a.GetIndex() != ID::NoIndex && b.GetIndex() != ID::NoIndex) return compare(a.GetIndex(), b.GetIndex());
    return a.GetMatchName().IsValid() && b.GetMatchName().IsValid() &&
           compare(a.GetMatchName().GetGuid().GuidToBytes(), b.GetMatchName().GetGuid().GuidToBytes());
}
bool Equal(ID const& a, ID const& b)
{
    return Compared(a, b, std::equal_to<>());
}
bool Less(ID const& a, ID const& b)
{
    return Compared(a, b, std::less<>());
}
bool SameName(ID const& a, ID const& b)
{
    return a.GetMatchName() == b.GetMatchName();
}
// Field by field, which operator== isn't.
bool Same(ID const& a, ID const& b)
{
    return a.GetIndex() == b.GetIndex() && SameName(a, b);
}
bool Same(Path const& a, IDs const& b)
{
    return std::ranges::equal(
        a.GetPathConst(), b, [](ID const& x, ID const& y) { return Same(x, y); });
}

class StreamPath : public testing::Test {
protected:
    kfshost::Session session_;
    ReportRecorder reports_;
    IDs const some_{{}, Name("a"), {Name("b")}, 0, 2, {2, Name("a")}, {0xFFFFFFFE, Name("b")}};

    // All of no, one and two identifiers.
    std::vector<IDs> ShortPaths() const
    {
        std::vector<IDs> paths{{}};
        for (ID const& first : some_) {
            paths.push_back({first});
            for (ID const& second : some_) paths.push_back({first, second});
        }
        return paths;
    }
    static Path Make(IDs const& ids)
    {
        Path path;
        for (ID const& id : ids) path.AddTail(id);
        return path;
    }
};

TEST_F(StreamPath, ComparesAsItsComponentsDo)
{
    for (ID const& a : some_)
        for (ID const& b : some_) EXPECT_EQ(!Equal(a, b), a != b);
    for (IDs const& first : ShortPaths()) {
        for (IDs const& second : ShortPaths()) {
            Path const a = Make(first), b = Make(second);
            bool const equal = std::ranges::equal(first, second, Equal);
            EXPECT_EQ(equal, a == b);
            EXPECT_EQ(!equal, a != b);
            EXPECT_EQ(std::ranges::lexicographical_compare(first, second, Less), a < b);
            EXPECT_EQ(std::ranges::equal(first, second, SameName), a.IsEqualByMatchName(b));
            EXPECT_EQ(first.size() < second.size() && std::equal(first.begin(), first.end(), second.begin(), Equal),
                      a.IsPrefixOf(b));
            EXPECT_EQ(!first.empty() && second.size() == 1 && Equal(first.back(), second[0]),
                      second.size() == 1 && a.IsEqualToTail(second[0]));
        }
    }
}

TEST_F(StreamPath, FindsNamesFromBothEnds)
{
    for (IDs const& ids : ShortPaths()) {
        Path const path = Make(ids);
        for (ID const& wanted : some_) {
            KFS_MatchName const& name = wanted.GetMatchName();
            auto const has = [&](ID const& id) { return id.GetMatchName() == name; };
            auto const first = std::find_if(ids.begin(), ids.end(), has);
            auto const last = std::find_if(ids.rbegin(), ids.rend(), has);
            unsigned int where = 77;
            EXPECT_EQ(first != ids.end(), path.FindFirstInstanceOfMatchName(name, &where));
            EXPECT_EQ(first == ids.end() ? ID::NoIndex : static_cast<unsigned int>(first - ids.begin()), where);
            EXPECT_EQ(first != ids.end(), path.FindFirstInstanceOfMatchName(name, nullptr));
            // An unset name is no name from behind.
            IDs const upTo = name.IsValid() ? IDs(ids.begin(), last.base()) : IDs();
            EXPECT_TRUE(Same(KFS_FindFromReverse(name, path), upTo));
            for (unsigned int level = 1; level < 4; ++level)
                EXPECT_EQ(level <= ids.size() && has(ids[level - 1]), path.HasTargetParent(name, level));
        }
    }
}

TEST_F(StreamPath, GrowsAndShrinksLikeAList)
{
    Dice dice(5);
    Path path;
    std::deque<ID> plain;
    for (int step = 0; step < 2000; ++step) {
        ID const id = some_[static_cast<std::size_t>(dice.Below(static_cast<int>(some_.size())))];
        int const what = dice.Below(plain.empty() || plain.size() > 8 ? 4 : 10);
        if (what == 0) {
            path.Clear(), plain.clear();
            EXPECT_EQ(0u, path.GetPath().capacity());
        } else if (what == 1) {
            path.AddHead(id), plain.push_front(id);
        } else if (what < 4) {
            path = Path(path, id), plain.push_back(id);
        } else if (what == 4) {  // of itself, also where that makes it move
            path.GetPath().shrink_to_fit();
            path.AddTail(path);
            plain.insert(plain.end(), plain.begin(), plain.begin() + static_cast<std::ptrdiff_t>(plain.size()));
        } else if (what == 5) {
            path.AddTail(path.GetHead()), plain.push_back(plain.front());
            path.AddHead(path.GetTail()), plain.push_front(plain.back());
        } else if (what < 8) {
            EXPECT_TRUE(Same(path.RemoveHead(), plain.front()));
            plain.pop_front();
        } else if (what == 8) {
            EXPECT_TRUE(Same(path.RemoveTail(), plain.back()));
            plain.pop_back();
        } else {
            path = path.GetParentPath(), plain.pop_back();
        }
        ASSERT_TRUE(Same(path, IDs(plain.begin(), plain.end()))) << step << ' ' << what;
    }
    EXPECT_TRUE(Same(Path(some_[1], some_[3], some_[5]), {some_[1], some_[3], some_[5]}));
}

TEST_F(StreamPath, AskedForWhatIsNotThereReportsAndThrows3)
{
    Path const empty, path(1, 2);
    const std::function<void()> questions[] = {
        [&] { path.GetComponent(2); }, [&] { path.GetComponent(0xFFFFFFFF); },
        [&] { empty.GetHead(); },      [&] { path.HasTargetParent(Name("a"), 0); },
        [&] { empty.GetTail(); },      [&] { empty.HasTargetParent(Name("a"), 0); },
    };
    for (auto const& ask : questions) {
        EXPECT_EQ(3, KFSp_Boundary(ask));
        std::vector<Reported> const seen = reports_.Take();
        ASSERT_EQ(1u, seen.size());
        EXPECT_EQ("asked for invalid component of property path", seen[0].text);
        EXPECT_EQ(8, seen[0].severity);
    }
}

// MurmurHash3 x64 128, computed by another implementation from the bytes that make up an identity: both fields count.
TEST_F(StreamPath, UidsAndTextsAreTheSameEverywhere)
{
    Path ten;
    for (unsigned int i = 0; i < 10; ++i) ten.AddTail(i);
    struct {
        Path path;
        char const *uid, *json;  // the text, or what it begins with; null where the row doesn't say
    } const rows[] = {
        {Path(), "18446fc522eee6326b8c4dfd5712ec7d", "{}"},
        {Path(ID(2, Name("layer"))), "1de6c0b3526a9f660d694e21f4a537a6", R"({"0":{"index":2,"matchName":"layer"}})"},
        {Path(Name("layer"), ID(258, Name("opacity"))), "74a4b1d4b243f6e04cdc24062ee36464", nullptr},
        {Path(3), "0a4b4999b01be40cdeebb6d31e5bd58c", R"({"0":{"index":3,"matchName":""}})"},
        {Path(Name("say \"hi\"\\"), 0), nullptr,
         R"({"0":{"index":4294967295,"matchName":"say \"hi\"\\"},"1":{"index":0,"matchName":""}})"},
        {ten, nullptr, R"({"00":{"index":0,"matchName":""},"01":{"index":1,)"},  // keys of equal width
    };
    for (auto const& row : rows) {
        EXPECT_TRUE(!row.uid || row.uid == MemoryFile::Hex(row.path.MakeUID().GuidToBytes()));
        EXPECT_TRUE(!row.json || Q_UTF16ToMBString(row.path.GetAs_JSON()).starts_with(row.json)) << row.json;
        Path read(7);
        read.SetFrom_JSON(row.path.GetAs_JSON());
        EXPECT_TRUE(Same(read.RemoveHead(), 7)) << "what it has stays in front";
        EXPECT_TRUE(Same(read, row.path.GetPathConst()));
    }
}

TEST_F(StreamPath, JsonThatIsNoPathLeavesThePathAlone)
{
    std::string const good = R"({"0": {"index": 1, "matchName": "z"}, "1": )";
    std::vector<std::string> bad{"", "7", "{", std::string(100000, '['), std::string(100000, '{')};
    for (char const* const second :
         {"", R"({"index": 1}})", R"({"matchName": "x"}})", R"({"index": "one", "matchName": "x"}})",
          R"({"index": -1, "matchName": "x"}})", R"({"index": 4294967296, "matchName": "x"}})", "3}"})
        bad.push_back(good + second);
    for (std::string const& text : bad) {
        SCOPED_TRACE(text.substr(0, 80));
        Path path(1, 2);
        EXPECT_NE(0, KFSp_Boundary([&] { path.SetFrom_JSON(Text(text)); }));
        EXPECT_TRUE(Same(path, {1, 2}));
        EXPECT_NO_REPORT(reports_);
    }
    // The index is read first, so that a component that is refused for it leaves no name behind.
    Path path;
    EXPECT_EQ(Q_Err_NotANumber, KFSp_Boundary([&] { path.SetFrom_JSON(Text(R"({"0": {"index": "one"}})")); }));
}

}  // namespace
