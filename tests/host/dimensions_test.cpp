#include "host/dimensions.h"

#include "curves/floatkeys.h"
#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "frame/frame.h"
#include "host/kinds.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"
#include "keystore/keyflags.h"
#include "keystore/lookup.h"
#include "overrides/streamexpression.h"
#include "tests/host/hosttest.h"

#include <cmath>
#include <cstring>
#include <random>
#include <set>

// Random leaders and random followers against what moving them promises: the same bits at keys, and between them what was
// told.

namespace {

using kfshost::MoveNotes;
using kfshost::StreamForm;
using kfshost::StreamKind;
using Row = std::vector<double>;

constexpr unsigned int Scale = 24;
constexpr int Seeds = 150;

// All that a caller can ask of a key.
struct Key {
    int time = 0;
    char in = 0, out = 0;
    unsigned short flags = 0;
    Row numbers;  // the value, speeds and influences

    bool operator==(Key const&) const = default;
};

std::vector<Key> KeysOf(KFS_Stream const& stream)
{
    std::vector<Key> keys;
    auto const dimension = static_cast<std::size_t>(stream.GetDimension());
    for (int i = 0; i < stream.GetKeyCount(); ++i) {
        Key key;
        key.numbers.resize(5 * dimension);
        double* const at = key.numbers.data();
        T_Time time{};
        EXPECT_EQ(0, KFS_IndexToTime(&stream, i, &time));
        key.time = time.value;
        EXPECT_EQ(0, KFS_GetKeyVelocityF(&stream, i, 0, at + dimension, at + 2 * dimension));
        EXPECT_EQ(0, KFS_GetKeyInfluence(&stream, i, at + 3 * dimension, at + 4 * dimension));
        EXPECT_EQ(0, KFS_GetKeyF(&stream, i, at, &key.in, &key.out));
        EXPECT_EQ(0, KFS_GetKeyFlags(&stream, i, &key.flags));
        key.flags &= KFS_KeyFlag_Continuous | KFS_KeyFlag_Modifiable;
        keys.push_back(std::move(key));
    }
    return keys;
}

Row At(KFS_Stream const& stream, int units)
{
    Row row(static_cast<std::size_t>(stream.GetDimension()));
    T_Time const time{units, Scale};
    EXPECT_EQ(0, KFS_GetValueFPlus(&stream, &time, 0, row.data(), nullptr, nullptr));
    return row;
}

class Dimensions : public HostTest {
protected:
    void SetUp() override
    {
        tree_ = std::make_unique<kfshost::SceneGroup>(Get_VX_StreamFactory());
        tree_->times.scale = Scale;
    }

    int Pick(int count) { return std::uniform_int_distribution<int>(0, count - 1)(random_); }
    double Number() { return Pick(5) == 0 ? Pick(3) : std::uniform_real_distribution<double>(-50.0, 50.0)(random_); }
    KFS_Interp Code() { return static_cast<KFS_Interp>(1 + (Pick(4) == 0 ? 2 : Pick(2))); }
    Row Numbers(std::size_t count)
    {
        Row row(count);
        for (double& number : row) number = Number();
        return row;
    }

    // Keys with all kinds of sides and handles; some of them automatic.
    void FillIn(KFS_Stream& stream, int keys)
    {
        auto const dimension = static_cast<std::size_t>(stream.IsSpatial() ? 1 : stream.GetDimension());
        std::set<int> times;
        while (static_cast<int>(times.size()) < keys) times.insert(Pick(120) - 30);
        for (int const at : times) {
            T_Time const time{at, Scale};
            Row const value = Numbers(static_cast<std::size_t>(stream.GetDimension()));
            ASSERT_EQ(0, KFS_InsertKeyF(&stream, &time, 0, value.data(), Code(), Code()));
        }
        for (int i = 0; i < keys; ++i) {
            if (Pick(3) == 0) {
                ASSERT_EQ(0, KFS_SetKeyModifiable(&stream, 1, i));
                continue;
            }
            Row const in = Numbers(dimension), out = Numbers(dimension);
            Row influence(dimension);
            for (double& share : influence) share = Pick(4) * 0.3;
            ASSERT_EQ(0, KFS_SetKeyVelocityF(&stream, i, in.data(), Pick(2) ? in.data() : out.data()));
            ASSERT_EQ(0, KFS_SetKeyInfluence(&stream, i, influence.data(), influence.data()));
        }
    }

    KFS_Stream& NewLeader(short dimension, StreamForm form)
    {
        kfshost::NodeGroup& node = tree_->AppendAnimation("a").AppendNode("n");
        node.PutChannel(StreamKind::Translation,
                        kfshost::StreamBuilder(StreamKind::Translation, dimension, Scale, form).Take());
        return *const_cast<KFS_Stream*>(node.FindChannel(StreamKind::Translation));
    }

    // What `leader` answers now against what it answered, all along.
    static void Compare(KFS_Stream const& leader, std::vector<Row> const& before, std::set<int> const& keys,
                        MoveNotes const& notes, double slack)
    {
        for (int time = First; time <= Last; ++time) {
            Row const& was = before[static_cast<std::size_t>(time - First)];
            Row const is = At(leader, time);
            bool const isSame = std::memcmp(was.data(), is.data(), was.size() * sizeof(double)) == 0;
            ASSERT_TRUE(isSame || !keys.contains(time)) << "key at " << time;
            for (std::size_t d = 0; d < was.size(); ++d)
                ASSERT_LE(std::abs(was[d] - is[d]), notes.worstError * slack + 1e-12 * notes.greatest) << time;
        }
    }
    static std::vector<Row> AllOf(KFS_Stream const& stream)
    {
        std::vector<Row> rows;
        for (int time = First; time <= Last; ++time) rows.push_back(At(stream, time));
        return rows;
    }

    static constexpr int First = -35;
    static constexpr int Last = 95;
    std::mt19937 random_;
    std::unique_ptr<kfshost::SceneGroup> tree_;
};

// Curves keep everything. Of paths positions at keys stay, and between them nothing is off by more than is told, to what
// sampling misses.
TEST_F(Dimensions, AreSeparatedAndJoinedAsIsTold)
{
    int bent = 0;
    for (int seed = 0; seed < Seeds && !HasFatalFailure(); ++seed) {
        SCOPED_TRACE(seed);
        random_.seed(static_cast<unsigned int>(seed));
        bool const isPath = seed % 3 == 2;
        KFS_Stream& leader = NewLeader(static_cast<short>(2 + Pick(2)), isPath ? StreamForm::Path : StreamForm::Curves);
        FillIn(leader, 1 + Pick(6));
        for (int i = 0; isPath && i < leader.GetKeyCount(); ++i) {
            Row const in = Numbers(3), out = Numbers(3);
            ASSERT_EQ(0, Pick(2) ? KFS_SetKeySpaceTangentsF(&leader, i, 0, in.data(), out.data()) : 0);
            ASSERT_EQ(0, Pick(5) == 0 ? KFS_SetKeyFloat(&leader, 1, i) : 0);
        }
        std::vector<Row> before = AllOf(leader);
        std::vector<Key> const keys = KeysOf(leader);
        std::set<int> times;
        for (Key const& key : keys) times.insert(key.time);

        MoveNotes const apart = kfshost::SeparateDimensions(leader);
        EXPECT_TRUE(kfshost::IsSeparated(leader) && leader.IsHidden() && leader.HasNoKeys());
        EXPECT_TRUE(isPath || (!apart.IsOff() && apart.bentArcs + apart.floatKeys == 0)) << apart.worstError;
        bent += apart.IsOff() ? 1 : 0;
        Compare(leader, before, times, apart, 1.5);
        for (int d = 0; d < leader.GetDimension(); ++d) {
            KFS_Stream const& follower = *leader.GetSeparationFollower(d);
            EXPECT_FALSE(follower.IsHidden());
            for (int const time : times)
                ASSERT_EQ(At(leader, time)[static_cast<std::size_t>(d)], At(follower, time)[0]);
        }
        before = AllOf(leader);
        MoveNotes const joined = kfshost::JoinDimensions(leader);
        EXPECT_TRUE(isPath || !joined.IsOff()) << joined.worstError;
        EXPECT_EQ(0U, joined.addedKeys + joined.heldKeys);
        Compare(leader, before, times, joined, 1.5);
        EXPECT_TRUE(isPath || keys == KeysOf(leader));
        EXPECT_FALSE(leader.AreDimensionsSeparated() || leader.IsHidden() || leader.IsAnimated(true) == keys.empty());
        for (int d = 0; d < leader.GetDimension(); ++d) {
            EXPECT_TRUE(leader.GetSeparationFollower(d)->IsHidden());
            EXPECT_FALSE(leader.GetSeparationFollower(d)->IsModified()) << "wouldn't be saved";
        }
    }
    EXPECT_LT(10, bent);
}

// Followers that an editor has given keys of their own, holds and constants among them.
TEST_F(Dimensions, OfDifferentKeysAreJoinedWithoutLoss)
{
    for (int seed = 0; seed < Seeds && !HasFatalFailure(); ++seed) {
        SCOPED_TRACE(seed);
        random_.seed(static_cast<unsigned int>(seed));
        KFS_Stream& leader = NewLeader(static_cast<short>(2 + seed % 2), StreamForm::Curves);
        FillIn(leader, 1);
        kfshost::SeparateDimensions(leader);
        std::set<int> times;
        for (int d = 0; d < leader.GetDimension(); ++d) {
            KFS_Stream& follower = *leader.GetSeparationFollower(d);
            ASSERT_EQ(0, KFS_RemoveKey(&follower, 0, nullptr));
            if (Pick(6) == 0) {
                ASSERT_EQ(0, follower.SetConstant(1, 0));
                double const number = Number();
                ASSERT_EQ(0, KFS_InsertKeyF(&follower, nullptr, 1, &number, 0, 0));
            } else {
                FillIn(follower, 1 + Pick(5));
            }
            for (Key const& key : KeysOf(follower)) times.insert(key.time);
        }
        std::vector<Row> const before = AllOf(leader);
        MoveNotes const notes = kfshost::JoinDimensions(leader);
        EXPECT_FALSE(notes.IsOff()) << notes.worstError << " at " << notes.worstTime.ToString();
        Compare(leader, before, times, notes, 1.0);
        EXPECT_EQ(times.size() + notes.heldKeys,
                  leader.HasNoKeys() ? 0U : static_cast<std::size_t>(leader.GetKeyCount()));
    }
}

// What is refused changes nothing.
TEST_F(Dimensions, ARefusalLeavesAllAsItWas)
{
    auto const refusal = [](auto const& move) -> std::string {
        try {
            move();
            return "";
        } catch (kfshost::DimensionsError const& error) {
            return error.what();
        }
    };
    KFS_Stream& path = NewLeader(2, StreamForm::Path);
    double const way[] = {0.0, 30.0, 0.0, -30.0};
    for (int i = 0; i < 2; ++i) {
        T_Time const time{i * 24, Scale};
        double const place[] = {i * 10.0, 0.0};
        ASSERT_EQ(0, KFS_InsertKeyF(&path, &time, 0, place, KFS_Interp_Linear, KFS_Interp_Linear));
    }
    for (int i = 0; i < 2; ++i) ASSERT_EQ(0, KFS_SetKeySpaceTangentsF(&path, i, 0, way + 2, way));
    std::vector<Row> const before = AllOf(path);
    EXPECT_TRUE(refusal([&] { kfshost::SeparateDimensions(path, 1e-6); }).starts_with("would be up to "));
    EXPECT_EQ("isn't separated", refusal([&] { kfshost::JoinDimensions(path); }));
    EXPECT_EQ(before, AllOf(path));
    EXPECT_EQ(2, path.GetKeyCount());
    kfshost::SeparateDimensions(path);
    EXPECT_EQ("is separated already", refusal([&] { kfshost::SeparateDimensions(path); }));
    for (KFS_Stream* const side : {&path, path.GetSeparationFollower(1)}) {
        KFS_SetStreamExpression(side, Q_AsciiToUTF16String("value"));
        EXPECT_EQ("has an expression, which has no form on the other side",
                  refusal([&] { kfshost::JoinDimensions(path); }));
        KFS_SetStreamExpression(side, u16str());
    }
    KFS_Stream& line = NewLeader(1, StreamForm::Curves);
    FillIn(line, 2);
    EXPECT_EQ("isn't of a kind whose dimensions can be separated", refusal([&] { kfshost::SeparateDimensions(line); }));
    KFS_Stream& flat = NewLeader(2, StreamForm::Curves);
    EXPECT_EQ("has neither keys nor a value", refusal([&] { kfshost::SeparateDimensions(flat); }));
}

}  // namespace
