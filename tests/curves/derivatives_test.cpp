#include "curves/derivatives.h"

#include "frame/errors.h"
#include "tests/curves/keyedstream.h"
#include "tests/services/museum/truth.h"
#include "tests/support/dice.h"
#include "tests/support/ownedvalues.h"

#include <functional>

namespace {

using Derivatives = StreamTest;

double Rate(KFS_Stream const* stream, int time)
{
    T_Time const at{time, stream->GetTimeScale()};
    double rate = -12345.0;
    EXPECT_EQ(0, KFS_GetDeriv(stream, &at, KFS_Deriv_Velocity, 0, 0, &rate, nullptr, nullptr, {}, {}));
    return rate;
}

Vector Way(KFS_Stream const* path, int time, unsigned char* atKey = nullptr)
{
    T_Time const at{time, path->GetTimeScale()};
    Vector way(static_cast<std::size_t>(path->GetDimension()), -7.0);
    EXPECT_EQ(0, KFS_GetSpaceTangent(path, &at, 0, 0, way.data(), atKey, nullptr));
    return way;
}

// The rate at x of a graph that begins at x = 0 is its slope there, give or take where the solver may stop. Where it is as
// good as vertical it is at least as steep as beside that.
void ExpectSlope(Curve const& graph, double x, double rate)
{
    truth::Real const seconds = graph.p[3][0];
    truth::Real least = 1e30L, low = 1e300L, high = -low, step = 0.0L;
    for (std::size_t k = 1; k < 4; ++k)
        step = std::max(step, std::fabs(truth::Real(graph.p[k][1]) - graph.p[k - 1][1]));
    for (truth::Real const beside : {-1.1e-13L, 0.0L, 1.1e-13L}) {
        truth::Real const t = truth::FirstReach(graph, 0, x + beside * seconds);
        truth::Real const dx = truth::FirstAt(graph, 0, t);
        least = std::min(least, dx / seconds);
        if (dx <= 0) continue;
        low = std::min(low, truth::FirstAt(graph, 1, t) / dx);
        high = std::max(high, truth::FirstAt(graph, 1, t) / dx);
    }
    if (least < 1e-11L) {
        EXPECT_GE(low > 0 ? rate : -rate, std::min(std::fabs(low), std::fabs(high)) * (1 - 1e-9L));
        return;
    }
    truth::Real const noise = 1e-13L * (step / seconds + std::max(std::fabs(low), std::fabs(high))) / least;
    EXPECT_GE(rate, low - noise);
    EXPECT_LE(rate, high + noise);
}

// Holds the rates of a stream and of a straight path whose only segment has this graph against it.
void CheckGraph(Curve graph)
{
    SCOPED_TRACE(testing::Message() << graph);
    constexpr int end = 1200;  // of 600 a second
    if (graph.p[3][0] != 2.0) return;
    for (std::size_t k : {1, 2}) {  // a key has no vertical handle, but it comes near
        std::size_t const key = k == 1 ? 0 : 3;
        if (graph.p[k][0] == graph.p[key][0] && graph.p[k][1] != graph.p[key][1])
            graph.p[k][0] += k == 1 ? 1e-9 : -1e-9;
    }
    auto const speed = [&](std::size_t key, std::size_t k) {
        double const dx = graph.p[k][0] - graph.p[key][0];
        return dx == 0.0 ? 0.0 : (graph.p[k][1] - graph.p[key][1]) / dx;
    };
    Handle const first{0.0, 0.0, speed(0, 1), graph.p[1][0] / 2.0};
    Handle const last{speed(3, 2), 1.0 - graph.p[2][0] / 2.0, 0.0, 0.0};
    auto const check = [&](KeyedStream const& stream, Curve const& wanted) {
        for (int const time : {1, 2, 137, 499, 600, 601, 1003, 1199}) {
            SCOPED_TRACE(testing::Message() << "at " << time << (stream->IsSpatial() ? " along a path" : ""));
            ExpectSlope(wanted, time / 600.0, Rate(stream, time));
        }
        EXPECT_EQ(stream->IsSpatial() && first.outInfluence == 0.0 ? 0.0 : first.outSpeed, Rate(stream, 0));
        EXPECT_EQ(stream->IsSpatial() && last.inInfluence == 0.0 ? 0.0 : last.inSpeed, Rate(stream, end));
        EXPECT_EQ(0.0, Rate(stream, -1));
        EXPECT_EQ(0.0, Rate(stream, end + 1));
    };
    bool const folds = std::min(graph.p[1][0], graph.p[2][0]) < 0.0 || std::max(graph.p[1][0], graph.p[2][0]) > 2.0;
    if (!folds) {
        KeyedStream stream = MakeKeyed({{0, graph.p[0][1]}, {end, graph.p[3][1]}}, KFS_Interp_Spline);
        stream.SetHandle(0, first).SetHandle(1, last);
        check(stream, graph);
    }
    double const length = graph.p[3][1] - graph.p[0][1];
    if (length <= 0.0) return;
    PathStream path({{0, {0.0, 0.0}}, {end, {length, 0.0}}}, KFS_Interp_Spline);
    path.Straighten().Settle();
    path.SetHandle(0, first).SetHandle(1, last);
    Curve way = Graph(2.0, first.outInfluence, last.inInfluence, 0.0, first.outSpeed * first.outInfluence * 2.0,
                      path.Arc(0) - last.inSpeed * last.inInfluence * 2.0, path.Arc(0));
    CRV_Curve kernel = way.Get();
    ASSERT_EQ(0, CRV_CurveSetNonDecreasing(&kernel, nullptr));
    check(path, way);
}

TEST_F(Derivatives, AreTheTruth)
{
    for (Exhibit const& exhibit : Museum)
        if (exhibit.curve.dimension == 2 && exhibit.curve.p[0][0] == 0.0) CheckGraph(exhibit.curve);
    Dice dice(7);
    auto const influence = [&] { return dice.Below(4) ? dice.Between(0.0, 1.0) : std::fabs(dice.Wild(9)); };
    for (int round = 0; round < Rounds(150); ++round) {
        double const out = std::min(influence(), 1.0), in = std::min(influence(), 1.0);
        CheckGraph(Graph(2.0, out, in, dice.Between(-9, 9), dice.Wild(3), dice.Wild(3), dice.Between(-9, 9)));
    }
}

// Whatever the keys: where a stream is smooth its rates are what its values differ by, and a path's direction points there.
TEST_F(Derivatives, AreDifferencesOfWhatIsRead)
{
    Dice dice(11);
    int compared = 0;
    for (int round = 0; round < Rounds(120); ++round) {
        bool const isPath = round % 2 == 1;
        auto const dimension = static_cast<short>(2 + dice.Below(2));
        KeyedStream stream({.dimension = dimension, .timeScale = 120000, .spatial = isPath});
        constexpr int keys = 6;
        int time = -100000;
        for (int k = 0; k < keys; ++k) {
            Vector value;
            for (int i = 0; i < dimension; ++i) value.push_back(dice.Between(-100, 100));
            stream.Key(time += 20000 + dice.Below(100000), value, KFS_Interp_Spline);
        }
        for (int k = 0; isPath && round % 3 && k < keys; ++k) EXPECT_EQ(0, KFS_SetKeySpModifiable(stream, 1, k));
        stream.Settle();
        constexpr int codes[] = {KFS_Interp_Linear, KFS_Interp_Spline, KFS_Interp_Spline, KFS_Interp_Hold};
        for (int k = 0; k < keys; ++k) {
            stream.Codes(k, codes[dice.Below(4)], codes[dice.Below(4)]);
            for (int i = 0; i < (isPath ? 1 : dimension); ++i) {
                double const least = isPath ? 0.0 : -200.0;
                stream.SetHandle(k,
                                 {dice.Between(least, 200), dice.Between(0.1, 0.9), dice.Between(least, 200),
                                  dice.Between(0.1, 0.9)},
                                 i);
            }
            stream.Flag(k, KFS_KeyFlag_Float, isPath && dice.Below(4) == 0);
        }
        for (int probe = 0; probe < 60; ++probe) {
            int const at = stream.Record(0)->time - 50 + dice.Below(time - stream.Record(0)->time + 100);
            auto const slope = [&](int reach) {
                Vector const before = stream.At(at - reach);
                Vector after = stream.At(at + reach);
                for (std::size_t i = 0; i < after.size(); ++i) after[i] = (after[i] - before[i]) * 60000.0 / reach;
                return after;
            };
            Vector const near = slope(20), far = slope(40);
            double const rough = Distance(near, far), size = Distance(near, Vector(near.size(), 0.0));
            if (rough > 0.01 * size) continue;  // a key, or nearly a corner
            T_Time const when{at, 120000};
            Vector rates(3, -1.0);
            unsigned char atKey = 9;
            ASSERT_EQ(0, KFS_GetDeriv(stream, &when, KFS_Deriv_Velocity, 0, 0, rates.data(), &atKey, nullptr, {}, {}));
            SCOPED_TRACE(testing::Message() << "round " << round << " at " << at);
            ++compared;
            if (isPath) {  // its values are as good as its arc tables, which differences over so short a time enlarge
                EXPECT_NEAR(size, rates[0], 4 * rough + 0.02 * size + 0.5);
                EXPECT_EQ(-1.0, rates[1]);
                Vector const way = Way(stream, at);
                double const length = Distance(way, Vector(way.size(), 0.0));
                EXPECT_TRUE(size < 5.0 || length > 0.0);
                for (std::size_t i = 0; i < way.size() && size >= 5.0; ++i)
                    EXPECT_NEAR(near[i] / size, way[i] / length, 4 * rough / size + 0.02);
            } else {
                rates.resize(near.size());
                EXPECT_LE(Distance(near, rates), rough + 1e-5 * (100.0 + size));
            }
        }
    }
    EXPECT_GT(compared, Rounds(2000));
}

TEST_F(Derivatives, FollowTheCodesOfTheSegment)
{
    constexpr char L = KFS_Interp_Linear, H = KFS_Interp_Hold, S = KFS_Interp_Spline;
    struct Row {
        char out, in;
        double rate;  // a quarter into a segment from 0 to 60 in one second
    } const rows[] = {{L, L, 60.0}, {H, L, 0.0}, {L, H, 0.0}, {H, H, 0.0}, {S, H, 0.0}};
    for (Row const& row : rows) {
        TestStream stream;
        stream.Key(0, {0.0}, L, row.out).Key(600, {60.0}, row.in, L).Key(1200, {90.0}, L);
        EXPECT_DOUBLE_EQ(row.rate, Rate(stream, 150)) << int(row.out) << int(row.in);
        double const value = stream.At1(150);  // the record holds no rate afterwards
        EXPECT_EQ(row.out == H ? 0.0 : row.in == H ? 60.0 : 15.0, value);
    }

    TestStream stream({.dimension = 2});
    stream.Key(0, {0.0, 0.0}).Key(600, {60.0, -30.0});
    T_Time const at{300, 600}, key{600, 600};
    double rates[2] = {7.0, 7.0};
    unsigned char atKey = 9;
    EXPECT_EQ(0, KFS_GetDeriv(stream, &at, KFS_Deriv_Velocity, 1, 0, rates, &atKey, nullptr, {}, {}));
    EXPECT_EQ(7.0, rates[0]) << "only keys were asked for";
    EXPECT_EQ(0, atKey);
    EXPECT_EQ(0, KFS_GetDeriv(stream, &key, KFS_Deriv_Velocity, 1, 0, rates, &atKey, nullptr, {}, {}));
    EXPECT_EQ(1, atKey);
    char** made = nullptr;
    EXPECT_EQ(0, KFS_GetDerivs(stream, &at, &at, 0, 0, nullptr, &made, nullptr, {}, {}));
    EXPECT_DOUBLE_EQ(-30.0, reinterpret_cast<double*>(*made)[1]);
    Q_FreeHandle(made);

    TestStream constant({.noKeys = true});
    EXPECT_EQ(7427, KFS_GetDeriv(constant, &at, 0, 0, 0, rates, nullptr, nullptr, {}, {}));
    EXPECT_EQ(1u, reports.Take().size());
    constant.Key(0, {5.0});
    EXPECT_EQ(0.0, Rate(constant, 77));
}

TEST_F(Derivatives, OfAPathAreItsSpeedAndItsDirection)
{
    TestStream path({.dimension = 2, .spatial = true});
    path.Key(0, {10.0, 20.0}).Key(600, {40.0, 60.0}).Key(1200, {40.0, 60.0}).Key(1800, {70.0, 60.0});
    auto const straighten = [](TestStream const& stream) {
        double const none[2] = {};
        for (int key = 0; key < stream.Count(); ++key) {
            ASSERT_EQ(0, KFS_SetKeySpaceTangentsF(stream, key, -1, none, none));
            ASSERT_EQ(0, KFS_SetKeySpModifiable(stream, 0, key));
        }
    };
    straighten(path);
    EXPECT_NEAR(50.0, Rate(path, 200), 1e-6);
    EXPECT_NEAR(0.0, Rate(path, 900), 1e-9);
    // At the last key the way in, which is turned to point forward, and at all others the way out.
    Vector const in{-3.0, 4.0}, out{5.0, -6.0};
    for (int key : {1, 3}) ASSERT_EQ(0, KFS_SetKeySpaceTangentsF(path, key, -1, in.data(), out.data()));
    unsigned char atKey = 9;
    EXPECT_EQ(out, Way(path, 600, &atKey));
    EXPECT_EQ(1, atKey);
    EXPECT_EQ((Vector{3.0, -4.0}), Way(path, 1800));
    EXPECT_EQ((Vector{3.0, -4.0}), Way(path, 1801, &atKey));
    EXPECT_EQ(0, atKey);
    KFSp_Numbers(path.Record(1))[4] = std::nan("");
    EXPECT_TRUE(std::isnan(Way(path, 600)[0])) << "no zero, so nothing is searched";

    // A stream that rests from 100 on, moves for 600 units and rests for good: what 29 steps find.
    TestStream resting({.dimension = 2, .spatial = true});
    resting.Key(0, {1.0, 2.0}).Key(100, {1.0, 2.0}).Key(700, {61.0, 2.0}).Key(800, {61.0, 2.0});
    straighten(resting);
    struct Row {
        int time;
        double way;
    } const rows[] = {{100, 0.1}, {99, 0.1}, {95, 0.1},  {72, 0.1},  {71, 0.0},
                      {10, 0.0},  {0, 0.0},  {-50, 0.0}, {801, 0.0}, {720, 0.0}};
    for (Row const& row : rows) {
        Vector const way = Way(resting, row.time);
        EXPECT_NEAR(row.way, way[0], 1e-3) << row.time;
        EXPECT_TRUE(way[1] == 0.0 && (row.way > 0.0 || way[0] == 0.0)) << row.time;
    }
    ASSERT_EQ(0, KFS_RemoveKey(resting, 3, nullptr));
    EXPECT_NEAR(0.1, Way(resting, 900)[0], 1e-3) << "behind the last key it looks back";
    ASSERT_EQ(0, KFS_RemoveKey(resting, 0, nullptr));
    EXPECT_NEAR(0.1, Way(resting, -900)[0], 1e-3) << "and before the first one ahead of it";
}

TEST_F(Derivatives, AreRefused)
{
    auto const derive = [](KFS_Stream const* stream, char mode, int time) {
        T_Time const at{time, 600};
        double rates[3] = {-1.0, -1.0, -1.0};
        int const code = KFS_GetDeriv(stream, &at, mode, 0, 0, rates, nullptr, nullptr, {}, {});
        EXPECT_TRUE(code == 0 || rates[0] == -1.0);
        return code;
    };
    auto const deriveMany = [](KFS_Stream const* stream, char*** made) {
        T_Time const at{0, 600};
        return KFS_GetDerivs(stream, &at, &at, 0, 0, nullptr, made, nullptr, {}, {});
    };
    char** made = nullptr;
    double way[3] = {};
    TestStream plain, empty, constant({.noKeys = true});
    plain.Key(0, {1.0}).Key(100, {2.0});
    auto const clients = OwnedValues::MakeStream(false), clientsPath = OwnedValues::MakeStream(false, true);
    for (auto* const stream : {clients.get(), clientsPath.get()}) OwnedValues::InsertKey(stream, 0, 1.0);
    DamagedStream const damaged;
    std::string const get = "get a value from";
    std::string const noPath = "attempt to inquire spatial tangents from a non-spatial stream.";
    std::string const noRate = "can#{rsquo}t compute derivative to a non-spatial custom value";
    std::string const noRates = "stream uses custom interpolation function: unable to inquire derivative.";
    struct Row {
        char const* why;
        std::function<int()> ask;
        int code;
        std::vector<Reported> reports;
    } const rows[] = {
        {"damaged", [&] { return derive(damaged.get(), 0, 0); }, 2, {DamagedReport(57, get)}},
        {"damaged, many", [&] { return deriveMany(damaged.get(), &made); }, 2, {DamagedReport(58, get)}},
        {"no keys", [&] { return derive(empty, 0, 0); }, KFS_Err_NoKeys, {KfsReport(57, NoKeysText(get))}},
        {"no value", [&] { return derive(constant, 0, 0); }, KFS_Err_NoKeys, {KfsReport(57, NoKeysText(get))}},
        {"no keys, many", [&] { return deriveMany(empty, &made); }, KFS_Err_NoKeys, {KfsReport(57, NoKeysText(get))}},
        {"nowhere to put them", [&] { return deriveMany(plain, nullptr); }, 3, {{0x1D003A, 8, "", 3}}},
        {"no direction",
         [&] { return KFS_GetSpaceTangent(plain, nullptr, 0, 0, way, nullptr, nullptr); },
         KFS_Err_NotSpatial,
         {KfsReport(97, noPath)}},
        {"a client's value", [&] { return derive(clients.get(), 0, 0); }, KFS_Err_CustomValue, {KfsReport(57, noRate)}},
        {"a client's, many",
         [&] { return deriveMany(clients.get(), &made); },
         KFS_Err_CustomValue,
         {KfsReport(58, noRates)}},
        {"a client's path",
         [&] { return derive(clientsPath.get(), 1, 0); },
         KFS_Err_CustomValue,
         {KfsReport(57, noRate)}},
        {"which has a speed", [&] { return derive(clientsPath.get(), 0, 50); }, 0, {}},
        {"no tangent at a key", [&] { return derive(plain, 1, 0); }, KFS_Err_NotSpatial, {KfsReport(32, noPath)}},
        {"nor between", [&] { return derive(plain, 1, 50); }, KFS_Err_NotSpatial, {KfsReport(32, noPath)}},
        {"nor behind", [&] { return derive(plain, 1, 500); }, KFS_Err_NotSpatial, {KfsReport(32, noPath)}},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(row.why);
        EXPECT_EQ(row.code, row.ask());
        EXPECT_EQ(row.reports, reports.Take());
        EXPECT_EQ(nullptr, made);
    }
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    Q_FailAllocation(1);
    EXPECT_EQ(KFS_Err_OutOfMemory, deriveMany(plain, &made));
    Q_FailAllocation(0);
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

}  // namespace
