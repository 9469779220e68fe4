#include "curves/floatkeys.h"
#include "curves/tangents.h"
#include "keystore/copykeys.h"
#include "keystore/edit.h"
#include "keystore/keyflags.h"
#include "tests/curves/pathstream.h"

#include <random>

// Long random edits, and the claim that repairing what they marked is as good as computing everything.

namespace {

using LazyRepair = StreamTest;

struct Script {
    char const* why;
    StreamOptions options;
    bool nonDecreasing = false;
    bool handles = false;   // temporal handles may be automatic
    bool tangents = false;  // edits of spatial tangents and flags
    bool floats = false;
};

StreamOptions Spatial(short dimension, bool automatic)
{
    StreamOptions options = PathOptions(dimension, automatic);
    options.timeScale = 600000;
    return options;
}

// Automatic tangents and automatic handles aren't mixed, nor automatic handles and float keys: a handle depends on arcs
// that depend on tangents that depend on neighbours, and an edit's mark reaches its own neighbours only.
Script const Scripts[] = {
    {.why = "plain", .options = {.dimension = 2}, .handles = true},
    {.why = "plain, non-decreasing", .options = {}, .nonDecreasing = true, .handles = true},
    {.why = "chords", .options = Spatial(4, false), .handles = true},
    {.why = "a path with tangents of the user's", .options = Spatial(2, false), .handles = true, .tangents = true},
    {.why = "a path with automatic tangents", .options = Spatial(3, true), .tangents = true},
    {.why = "a path with float keys", .options = Spatial(2, false), .tangents = true, .floats = true},
};

class Editor {
public:
    // `steady`: all sides stay splines, and the stream is up to date when handles, tangents and flags are set. A side
    // that stops being a spline or automatic while it is stale keeps what it had.
    Editor(Script const& script, unsigned int seed, bool steady = false)
        : script_(script),
          random_(seed),
          steady_(steady),
          stream_(script.options)
    {
        stream_.StreamFlag(KFS_StreamFlag_NonDecreasing, script.nonDecreasing);
        for (int i = 0; i < 6; ++i) Insert(1000 * i);
    }

    KeyedStream& Stream() { return stream_; }

    void Edit()
    {
        int const kinds = script_.floats ? 11 : script_.tangents ? 10 : 8;
        switch (Pick(0, kinds - 1)) {
        case 0:
        case 1: Insert(Inside()); break;
        case 2: InsertOnCurve(); break;
        case 3: SetValue(); break;
        case 4: Remove(); break;
        case 5: Move(); break;
        case 6: SetHandles(); break;
        case 7: SetFlags(); break;
        case 8: SetTangents(); break;
        case 9: SetSpFlags(); break;
        default: Check(KFS_SetKeyFloat(stream_, static_cast<unsigned char>(Pick(0, 2)), Index())); break;
        }
    }

private:
    int Pick(int low, int high) { return std::uniform_int_distribution<int>(low, high)(random_); }
    double Number(double low, double high) { return std::uniform_real_distribution<double>(low, high)(random_); }
    int Index() { return Pick(0, stream_.Count() - 1); }
    int InnerIndex() { return Pick(1, stream_.Count() - 2); }
    char Code()
    {
        int const code = Pick(1, 9) > 8 ? KFS_Interp_Hold : Pick(KFS_Interp_Linear, KFS_Interp_Spline);
        return static_cast<char>(steady_ ? KFS_Interp_Spline : code);
    }
    // The list's ends stay where they are, so that no float key comes to stand there.
    int Inside() { return Pick(1, 4999); }
    void Check(int code) { EXPECT_EQ(0, code); }

    Vector Place()
    {
        Vector place;
        for (int i = 0; i < stream_->GetDimension(); ++i) place.push_back(Number(-100, 100));
        return place;
    }

    void Insert(int time)
    {
        Vector const place = Place();
        char const in = Code();
        char const out = Code();
        T_Time const at = stream_.Time(time);
        Check(KFS_InsertKeyF(stream_, &at, 1, place.data(), in, out));
    }

    void InsertOnCurve()
    {
        T_Time const at = stream_.Time(Inside());
        bool const decided = Pick(0, 1) != 0;
        Check(KFS_InsertKeyF(stream_, &at, 1, nullptr, decided ? Code() : 0, decided ? Code() : 0));
    }

    void SetValue()
    {
        Vector const place = Place();
        int const index = Index();
        Check(KFS_SetKeyF(stream_, index, place.data(), Pick(0, 1) ? Code() : 0, Pick(0, 1) ? Code() : 0));
    }

    void Remove()
    {
        if (stream_.Count() > 5) Check(KFS_RemoveKey(stream_, InnerIndex(), nullptr));
    }

    void Move()
    {
        if (stream_.Count() < 4) return;
        int const index = InnerIndex();
        Check(KFS_SetKeyTime(stream_, index, nullptr, Inside(), nullptr, nullptr));
    }

    void Settle()
    {
        if (steady_) Check(stream_->UpdateStream());
    }

    void SetHandles()
    {
        Settle();
        int const index = Index();
        auto const size = static_cast<std::size_t>(stream_->GetDimension());
        Vector const speeds(size, Number(0, 200));
        Vector const influences(size, Number(0.05, 0.95));
        bool const in = Pick(0, 1) != 0;
        Check(KFS_SetKeyVelocityF(stream_, index, in ? speeds.data() : nullptr, in ? nullptr : speeds.data()));
        Check(KFS_SetKeyInfluence(stream_, index, in ? nullptr : influences.data(), influences.data()));
    }

    void SetFlags()
    {
        Settle();
        int const index = Index();
        Check(KFS_SetKeyContinuous(stream_, static_cast<unsigned char>(Pick(0, 1)), index));
        if (script_.handles) Check(KFS_SetKeyModifiable(stream_, static_cast<unsigned char>(Pick(0, 1)), index));
    }

    void SetTangents()
    {
        Settle();
        int const index = Index();
        Vector const in = Place();
        Vector const out = Place();
        bool const both = Pick(0, 1) != 0;
        Check(KFS_SetKeySpaceTangentsF(stream_, index, 0, both ? in.data() : nullptr, out.data()));
    }

    void SetSpFlags()
    {
        Settle();
        int const index = Index();
        Check(KFS_SetKeySpFlags(stream_, index, 3, static_cast<unsigned int>(Pick(0, 3))));
    }

    Script script_;
    std::mt19937 random_;
    bool steady_;
    KeyedStream stream_;
};

// What two streams must agree on, bit for bit.
void ExpectSame(KeyedStream const& expected, KeyedStream const& actual)
{
    ASSERT_EQ(expected.Times(), actual.Times());
    int const last = expected.Count() - 1;
    for (int i = 0; i <= last; ++i) {
        SCOPED_TRACE(testing::Message() << "key " << i << " of " << last + 1);
        KFS_KeyScalar const* const a = expected.Record(i);
        KFS_KeyScalar const* const b = actual.Record(i);
        EXPECT_EQ(std::tie(a->inInterp, a->outInterp, a->flags), std::tie(b->inInterp, b->outInterp, b->flags));
        ASSERT_EQ(expected.Numbers(i), actual.Numbers(i));
        if (!expected->IsSpatial()) continue;
        EXPECT_EQ(a->spFlags, b->spFlags);
        EXPECT_EQ(expected.GetHandle(i), actual.GetHandle(i));
        EXPECT_TRUE(i == last || a->arcLength == b->arcLength);  // nothing begins at the last key
    }
    for (int time = -50; time < 5100; time += 37) ASSERT_EQ(expected.At(time), actual.At(time)) << "at " << time;
}

TEST_F(LazyRepair, EqualsComputingEverything)
{
    for (Script const& script : Scripts) {
        for (unsigned int seed = 1; seed <= 8; ++seed) {
            Editor editor(script, seed);
            for (int step = 0; step < 150; ++step) {
                editor.Edit();
                if (step % 5 != 4) continue;  // several edits share a repair
                KeyedStream fresh(script.options);
                fresh.StreamFlag(KFS_StreamFlag_NonDecreasing, script.nonDecreasing);
                ASSERT_EQ(0, KFS_CopyKeys(editor.Stream(), nullptr, fresh));
                ASSERT_EQ(0, KFS_ForceUpdateStream(fresh));
                ASSERT_EQ(0, editor.Stream()->UpdateStream());
                SCOPED_TRACE(testing::Message() << script.why << ", seed " << seed << ", step " << step);
                ExpectSame(fresh, editor.Stream());
                EXPECT_EQ(0, editor.Stream().Pins());
                if (HasFailure()) return;
            }
        }
    }
}

TEST_F(LazyRepair, DoesNotDependOnWhenItHappensAndIsNotSeenByReads)
{
    for (Script const& script : Scripts) {
        if (script.floats) continue;  // a stale float key stands at another time, so later edits meet another list
        for (unsigned int seed = 100; seed < 120; ++seed) {
            SCOPED_TRACE(testing::Message() << script.why << ", seed " << seed);
            Editor eager(script, seed, true);
            Editor lazy(script, seed, true);
            for (int step = 0; step < 60; ++step) {
                eager.Edit();
                lazy.Edit();
                ASSERT_EQ(0, seed % 2 == 0 ? eager.Stream()->UpdateStream() : 0);
                int const time = (step * 977) % 5000;
                Vector const once = eager.Stream().At(time);
                eager.Stream().At(4999 - time);
                EXPECT_EQ(once, eager.Stream().At(time)) << "step " << step;
            }
            ASSERT_EQ(0, eager.Stream()->UpdateStream());
            ASSERT_EQ(0, lazy.Stream()->UpdateStream());
            ExpectSame(eager.Stream(), lazy.Stream());
            if (HasFailure()) return;
        }
    }
}

}  // namespace
