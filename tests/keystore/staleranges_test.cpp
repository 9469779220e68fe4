#include "keystore/stream.h"

#include "tests/support/streams.h"

#include <algorithm>
#include <random>

namespace {

using Range = std::array<int, 2>;
constexpr int None = KFS_INVALID_INDEX;

class StaleRanges : public StreamTest {
protected:
    static std::unique_ptr<TestStream> WithKeys(int count, bool spatial = false)
    {
        auto stream = std::make_unique<TestStream>(StreamOptions{.dimension = 2, .spatial = spatial});
        for (int i = 0; i < count; ++i) stream->Key(10 * i, {1.0 * i, 2.0 * i});
        EXPECT_EQ(0, (*stream)->UpdateStream());
        return stream;
    }
    static void Clean(TestStream const& stream)
    {
        for (int* const range : {stream->GetInvalidKeyIndexForModify(), stream->GetArcInvalidKeyIndexForModify()}) {
            range[0] = None;
            range[1] = None;
        }
    }
};

TEST_F(StaleRanges, AMarkReachesBackFromItsIndex)
{
    struct Row {
        char const* why;
        int index;
        short count;
        Range range;
    };
    Row const rows[] = {
        {"a key and its neighbours", 4, 2, {2, 4}},
        {"cut at the start", 1, 4, {0, 1}},
        {"no reach, no mark", 3, 0, {None, None}},
        {"nor with less than none", 3, -2, {None, None}},
        {"past the end, as far as it reaches in", 7, 4, {3, 5}},
        {"past the end by its whole reach, on the last key", 7, 2, {5, 5}},
        {"far past the end", 2000000000, 32767, {5, 5}},
        {"from the end", -1, 2, {3, 5}},
        {"more than all", -1, 32767, {0, 5}},
        {"nothing from the end", -1, 0, {None, None}},
    };
    auto const plain = WithKeys(6);
    auto const spatial = WithKeys(6, true);
    for (Row const& row : rows) {
        SCOPED_TRACE(row.why);
        for (TestStream* const stream : {plain.get(), spatial.get()}) {
            Clean(*stream);
            EXPECT_EQ(0, (*stream)->SetInvalid(row.index, row.count));
            EXPECT_EQ(row.range, stream->Stale());
            EXPECT_EQ(TestStream::NotStale, stream->ArcStale());
            Clean(*stream);
            EXPECT_EQ(0, (*stream)->SetArcInvalid(row.index, row.count));
            EXPECT_EQ(row.range, stream->ArcStale());
            EXPECT_EQ(TestStream::NotStale, stream->Stale());
            EXPECT_EQ(0, stream->Pins());
        }
    }
}

// The range is the hull of all keys that any mark has named.
TEST_F(StaleRanges, MarksAddUp)
{
    std::mt19937 random(210);
    auto const below = [&](int bound) { return static_cast<int>(random() % static_cast<unsigned>(bound)); };
    for (int round = 0; round < 60; ++round) {
        int const keys = 1 + below(12);
        auto const stream = WithKeys(keys, round % 2 != 0);
        std::vector<bool> marked(static_cast<std::size_t>(keys));
        for (int mark = 0; mark < 4; ++mark) {
            int const index = below(keys + 4);
            int const count = below(6) - 1;
            EXPECT_EQ(0, (*stream)->SetInvalid(index, static_cast<short>(count)));
            EXPECT_EQ(0, (*stream)->SetArcInvalid(index, static_cast<short>(count)));
            int const from = std::min(index - count, keys - 1);  // behind the list it falls on the last key
            for (int key = 0; key < keys && count > 0; ++key)
                if (key >= from && key <= index) marked[static_cast<std::size_t>(key)] = true;
            auto const first = std::find(marked.begin(), marked.end(), true);
            auto const last = std::find(marked.rbegin(), marked.rend(), true);
            Range const hull = first == marked.end() ? Range{None, None}
                                                     : Range{static_cast<int>(first - marked.begin()),
                                                             keys - 1 - static_cast<int>(last - marked.rbegin())};
            EXPECT_EQ(hull, stream->Stale()) << "round " << round << " mark " << mark;
            EXPECT_EQ(hull, stream->ArcStale());
        }
    }
}

TEST_F(StaleRanges, ARangeOnASpatialStreamDoesNotEndOnAFloatKey)
{
    struct Row {
        char const* floats;  // by key, 'f' floats
        int index;
        short count;
        Range range;
    };
    Row const rows[] = {
        {"..f...", 3, 1, {1, 3}},                                  // 2 floats: back to 1
        {"..ff..", 3, 1, {1, 4}},                                  // both ends
        {".ffff.", 3, 1, {0, 5}}, {"ffffff", 3, 1, {0, 5}},        // the ends of the list stop it
        {"....ff", 4, 1, {3, 5}}, {"..f...", 2, 0, {None, None}},  // nothing is marked, nothing is widened
        {".f..f.", 3, 1, {2, 3}},                                  // outside of the range
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(row.floats);
        for (bool const spatial : {true, false}) {
            auto const stream = WithKeys(6, spatial);
            for (int i = 0; i < 6; ++i)
                if (row.floats[i] == 'f') stream->Record(i)->flags |= KFS_KeyFlag_Float;
            EXPECT_EQ(0, (*stream)->SetInvalid(row.index, row.count));
            EXPECT_EQ(0, (*stream)->SetArcInvalid(row.index, row.count));
            Range const plain = row.count < 1 ? Range{None, None} : Range{row.index - row.count, row.index};
            EXPECT_EQ(spatial ? row.range : plain, stream->Stale());
            EXPECT_EQ(plain, stream->ArcStale()) << "arcs don't depend on times";
            EXPECT_EQ(0, stream->Pins());
        }
    }
}

TEST_F(StaleRanges, WithoutKeysNothingIsStale)
{
    TestStream const empty;
    TestStream constant({.noKeys = true});
    constant.Key(0, {1.0});
    for (TestStream const* const stream : {&empty, static_cast<TestStream const*>(&constant)}) {
        int* const range = (*stream)->GetInvalidKeyIndexForModify();
        int* const arcRange = (*stream)->GetArcInvalidKeyIndexForModify();
        range[0] = range[1] = arcRange[0] = arcRange[1] = 3;
        EXPECT_EQ(0, (*stream)->SetInvalid(1, 2));
        EXPECT_EQ(TestStream::NotStale, stream->Stale());
        EXPECT_EQ((Range{3, 3}), stream->ArcStale());
        EXPECT_EQ(0, (*stream)->SetArcInvalid(-1, 2));
        EXPECT_EQ(TestStream::NotStale, stream->ArcStale());
    }
}

TEST_F(StaleRanges, ARenderMarksItsOwnKeys)
{
    auto const stream = WithKeys(4);
    {
        Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
        EXPECT_EQ(0, (*stream)->SetInvalid(2, 1));
        EXPECT_EQ(0, (*stream)->SetArcInvalid(2, 1));
        EXPECT_EQ((Range{1, 2}), stream->Stale());
    }
    EXPECT_EQ(TestStream::NotStale, stream->Stale());
    EXPECT_EQ(TestStream::NotStale, stream->ArcStale());
}

}  // namespace
