#include "keystore/evaluate.h"

#include "curves/derivatives.h"
#include "frame/errors.h"
#include "keystore/attributes.h"
#include "keystore/lookup.h"
#include "overrides/parambag.h"
#include "tests/support/baregroup.h"
#include "tests/support/streams.h"
#include "tests/support/text.h"

#include <boost/weak_ptr.hpp>

#include <cmath>
#include <stdexcept>

namespace {

// An engine whose expression is a lambda.
class Engine : public KFS_ExpState {
public:
    std::function<int(KFS_Stream const*, int, double*)> expression;
    KFS_Stream const* target = nullptr;
    bool hasContext = true;
    bool canRun = true;
    int asked = 0;

    void EvalExprValue(KFS_Stream const* stream, int time, int, void* value, KFS_ParamBag const*) override
    {
        double number = 0.0;
        Run(stream, time, &number);
        short const whole = static_cast<short>(number);
        std::memcpy(value, &whole, sizeof whole);
    }
    void EvalExprValueF(KFS_Stream const* stream, int time, int, double* value, KFS_ParamBag const*) override
    {
        Run(stream, time, value);
    }
    void EvalNoExprValue(KFS_Stream const* stream, int time, int, void* value, unsigned char* atKey,
                         KFS_ParamBag const*, KFS_InterpFunc* interpFunc, long refcon) override
    {
        KFS_GetValueNoExpr(stream, time, 0, value, atKey, nullptr, interpFunc, refcon);
    }
    void EvalNoExprValueF(KFS_Stream const* stream, int time, int, double* value, unsigned char* atKey,
                          KFS_ParamBag const*) override
    {
        KFS_GetValueFNoExpr(stream, time, 0, value, atKey, nullptr);
    }
    void ResolveExprTarget(KFS_Stream const** stream, int*, KFS_ParamBag const*, KFS_ParamBag*) override
    {
        ++asked;
        if (target) *stream = target;
    }
    boost::shared_ptr<KFS_ExprContext> GetExprContext(KFS_Stream const*) override
    {
        struct Context : KFS_ExprContext {
            explicit Context(bool can) : can_(can) {}
            bool CanEvaluate() const override { return can_; }
            bool can_;
        };
        return boost::shared_ptr<KFS_ExprContext>(hasContext ? new Context(canRun) : nullptr);
    }

private:
    void Run(KFS_Stream const* stream, int time, double* value)
    {
        if (int const code = expression(stream, time, value)) throw int{code};
    }
};

class Evaluate : public StreamTest {
protected:
    Evaluate() : engine(new Engine)
    {
        context = Q_RenderContext::MakeNewContext(false);
        context->SetState(engine);
        engine->expression = [](KFS_Stream const*, int time, double* value) { return *value = 1000.0 + time, 0; };
    }
    boost::shared_ptr<Engine> engine;
    boost::shared_ptr<Q_RenderContext> context;
};

TEST_F(Evaluate, TheStagesGoInTheirOrder)
{
    Q_ScSetCurrentRenderContext const current(context);
    TestStream stream;
    stream.Key(0, {1.0}).Key(100, {2.0});
    KFS_ExprInfo& info = stream->GetExprInfoForModify();
    struct Row {
        char const* why;
        std::function<void()> arrange;
        int flags;
        int code;
        double value;
        int atKey;    // 9: untouched
        double rate;  // of an expression, as long as it is switched on, whether it has a value or not
    } const rows[] = {
        {"no expression", [] {}, 0, 0, 2.0, 1, 6.0},
        {"an expression answers, and no key stands there", [&] { info.SetExpression(Text("x")); }, 0, 0, 1100.0, 0,
         600.0},
        {"the flag goes straight to the keys", [] {}, 1, 0, 2.0, 1, 6.0},
        {"the host's flags don't", [] {}, 0xF0, 0, 1100.0, 0, 600.0},
        {"switched off", [&] { info.SetFlags(KFS_ExprFlag_Disabled); }, 0, 0, 2.0, 1, 6.0},
        {"the engine can't run now", [&] { info.SetFlags(0), engine->canRun = false; }, 0, 0, 2.0, 1, 0.0},
        {"there is no context to run it in", [&] { engine->hasContext = false; }, 0, 0, 2.0, 1, 0.0},
        {"no value here: the keys answer",
         [&] {
             engine->hasContext = engine->canRun = true;
             engine->expression = [](KFS_Stream const*, int, double*) -> int { return KFS_Err_ExprNoValue; };
         },
         0, 0, 2.0, 1, 0.0},
        {"any other error is the result",
         [&] { engine->expression = [](KFS_Stream const*, int, double*) { return 99; }; }, 0, 99, -1.0, 9, -1.0},
    };
    T_Time const at{100, 600};
    for (Row const& row : rows) {
        SCOPED_TRACE(row.why);
        row.arrange();
        double value = -1.0;
        unsigned char atKey = 9;
        EXPECT_EQ(row.code, KFS_GetValueFPlus(stream, &at, row.flags, &value, &atKey, nullptr));
        EXPECT_EQ(row.value, value);
        EXPECT_EQ(row.atKey, atKey);
        double rate = -1.0;
        EXPECT_EQ(row.code,
                  KFS_GetDeriv(stream, &at, KFS_Deriv_Velocity, 0, row.flags, &rate, nullptr, nullptr, {}, {}));
        EXPECT_EQ(row.rate, rate);
    }
    engine->expression = [](KFS_Stream const*, int, double*) -> int { throw std::runtime_error("bad token"); };
    double value = 0.0;
    EXPECT_NE(0, KFS_GetValueFPlus(stream, &at, 0, &value, nullptr, nullptr));
    EXPECT_EQ("bad token", reports.Take().at(0).text);
    int const asked = engine->asked;
    EXPECT_EQ(0, KFS_GetValueFPlus(stream, &at, 0, nullptr, nullptr, nullptr)) << "nobody wants a value";
    EXPECT_EQ(asked, engine->asked);
}

TEST_F(Evaluate, AnExpressionMayHaveItsEngineReplaced)
{
    Q_ScSetCurrentRenderContext const current(context);
    TestStream stream;
    stream.Key(0, {1.0});
    stream->GetExprInfoForModify().SetExpression(Text("x"));
    boost::weak_ptr<Engine> const old(engine);
    engine->expression = [&](KFS_Stream const*, int, double*) {
        context->SetState(boost::shared_ptr<Engine>(new Engine));
        engine.reset();
        EXPECT_FALSE(old.expired()) << "it is running";
        return KFS_Err_ExprNoValue;
    };
    EXPECT_EQ(1.0, stream.At1(0)) << "the keys, as the old one reads them";
    EXPECT_TRUE(old.expired());
}

TEST_F(Evaluate, AnotherStreamsExpressionIsConvertedThroughDoubles)
{
    Q_ScSetCurrentRenderContext const current(context);
    TestStream stream({.type = KFS_Type_Fixed});
    TestStream const source({.type = KFS_Type_S16});
    stream.Key(0, {0.0});
    stream->GetExprInfoForModify().SetExpression(Text("other"));
    engine->target = source;
    engine->expression = [](KFS_Stream const*, int, double* value) { return *value = 3.0, 0; };
    int fixed = 0;
    T_Time const at{0, 600};
    ASSERT_EQ(0, KFS_GetValuePlus(stream, &at, 0, &fixed, nullptr, nullptr, nullptr, 0));
    EXPECT_EQ(3 * 65536, fixed);
}

TEST_F(Evaluate, AVectorGoesIntoAValueBuffer)
{
    std::array<unsigned char, 4> four{};
    M_Vector4T<double> const vector{{1.0, 2.0, 3.4, 254.6}};
    TestStream const wide({.dimension = 4, .type = KFS_Type_U8});
    KFS_PostCacheVector4Value(wide, 0, vector, nullptr, four.data());
    EXPECT_EQ((std::array<unsigned char, 4>{1, 2, 3, 255}), four);
    void* pointer = nullptr;
    KFS_PostCacheVector4Value(wide, 0, vector, four.data(), &pointer);
    EXPECT_EQ(four.data(), pointer);
}

TEST_F(Evaluate, DoublesAreRefusedForCustomValues)
{
    KFS_ValueDesc const desc{1, 8, 0, [](KFS_Stream const*, long, int, int) { return 0; }};
    KFS_Stream stream(1, 600, 0, 0, 7, 0, desc, nullptr, nullptr, false);
    const std::string text = "can#{rsquo}t compute floating point value(s) for a custom value";
    T_Time const at{0, 600};
    double value = -1.0;
    char** handle = nullptr;
    EXPECT_EQ(7441, KFS_GetValueF(&stream, &at, 0, &value, nullptr, nullptr));
    EXPECT_EQ(7441, KFS_GetValuesFPlus(&stream, &at, &at, 1, 0, &handle));
    EXPECT_EQ(7441, KFSp_Boundary([&] { KFS_GetValueFNoExpr(&stream, 0, 0, &value, nullptr, nullptr); }));
    EXPECT_EQ((std::vector{KfsReport(115, text), KfsReport(78, text), KfsReport(78, text)}), reports.Take());
    EXPECT_EQ(-1.0, value);
}

TEST_F(Evaluate, WithoutAStateThatSaysHowThereIsACodeAndNoCrash)
{
    TestStream stream;
    stream.Key(0, {1.0});
    T_Time const at{0, 600};
    double value = -1.0;
    {
        Q_ScSetCurrentRenderContext const bare(Q_RenderContext::MakeNewContext(false));
        EXPECT_EQ(3, KFS_GetValueFPlus(stream, &at, 0, &value, nullptr, nullptr));
        EXPECT_EQ((std::vector<Reported>{{0x1D0071, 8, "", 3}}), reports.Take());
    }
    Q_ScSetCurrentRenderContext const none(nullptr);
    EXPECT_EQ(3, KFS_GetValueFPlus(stream, &at, 0, &value, nullptr, nullptr));
    EXPECT_EQ(2U, reports.Take().size()) << "the missing context is reported by itself";
    EXPECT_EQ(-1.0, value);
    EXPECT_EQ(0, KFS_GetValuePlus(stream, &at, 0, &value, nullptr, nullptr, nullptr, 0)) << "the project has a context";
    EXPECT_EQ(1.0, value);
}

TEST_F(Evaluate, SamplesComeInOneHandle)
{
    TestStream stream({.dimension = 2});
    stream.Key(0, {0.0, 10.0}).Key(60, {6.0, 16.0});
    T_Time const start{0, 600}, step{1, 30};
    char** handle = nullptr;
    ASSERT_EQ(0, KFS_GetValuesFPlus(stream, &start, &step, 3, 0, &handle));
    ASSERT_EQ(3 * 2 * sizeof(double), Q_GetHandleSize(handle));
    auto const* const values = reinterpret_cast<double const*>(*handle);
    EXPECT_EQ((std::vector{0.0, 10.0, 2.0, 12.0, 4.0, 14.0}), std::vector(values, values + 6));
    Q_FreeHandle(handle);
    ASSERT_EQ(0, KFS_GetValuesFPlus(stream, &start, &step, 0, 0, &handle));
    EXPECT_EQ(0u, Q_GetHandleSize(handle));
    Q_FreeHandle(handle);
    handle = nullptr;
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    T_Time const hugeStep{1000000000, 600};
    EXPECT_NE(0, KFS_GetValuesFPlus(stream, &start, &hugeStep, 4, 0, &handle)) << "the fourth time can't be held";
    EXPECT_EQ(nullptr, handle);
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
    EXPECT_EQ(3, KFS_GetValuesFPlus(stream, &start, &step, 1, 0, nullptr));
    EXPECT_EQ((std::vector<Reported>{{0x1D0072, 8, "", 3}}), reports.Take());
    Q_FailAllocation(1);
    EXPECT_EQ(4, KFS_GetValuesFPlus(stream, &start, &step, 1, 0, &handle));
    Q_FailAllocation(0);
}

// A rate of an expression is the difference to the next unit of time, and the filters see what goes in and comes out.
TEST_F(Evaluate, RatesOfExpressionsPassTheFilters)
{
    Q_ScSetCurrentRenderContext const current(context);
    TestStream path({.dimension = 3, .spatial = true});
    path.Key(0, {0.0, 0.0, 0.0});
    path->GetExprInfoForModify().SetExpression(Text("x"));
    engine->expression = [](KFS_Stream const*, int time, double* value) {
        for (int i = 0; i < 3; ++i) value[i] = (i + 1) * (time > 7 ? 1.0 : 0.0);
        return 0;
    };
    T_Time const at{7, 600};
    auto const derive = [&](char mode, int sampleCode, int code, std::vector<double>* seen) {
        std::vector<double> rates(4, -1.0);
        EXPECT_EQ(sampleCode + code, KFS_GetDeriv(
                                         path, &at, mode, 0, 0, rates.data(), nullptr, nullptr,
                                         [&](double* value) { return value[1] *= 2.0, sampleCode; },
                                         [&](double* rate, bool isSpeed) {
                                             seen->push_back(isSpeed ? -*rate : *rate);
                                             return *rate += 1.0, code;
                                         }));
        return rates;
    };
    std::vector<double> seen;
    double const speed = std::sqrt(600.0 * 600.0 + 2400.0 * 2400.0 + 1800.0 * 1800.0);
    EXPECT_EQ((std::vector{speed + 1.0, -1.0, -1.0, -1.0}), derive(KFS_Deriv_Velocity, 0, 0, &seen));
    EXPECT_EQ((std::vector{601.0, 2401.0, 1801.0, -1.0}), derive(KFS_Deriv_SpaceTangent, 0, 0, &seen));
    EXPECT_EQ((std::vector{-speed, 600.0, 2400.0, 1800.0}), seen);
    EXPECT_EQ(std::vector(4, -1.0), derive(KFS_Deriv_SpaceTangent, 0, 77, &seen));
    EXPECT_EQ(std::vector(4, -1.0), derive(KFS_Deriv_Velocity, 78, 0, &seen));
    EXPECT_EQ(5u, seen.size());
    double still[3] = {};
    T_Time const later{8, 600};
    EXPECT_EQ(0, KFS_GetSpaceTangent(path, &later, 0, 0, still, nullptr, nullptr)) << "nothing is searched here";
    EXPECT_EQ(0.0, still[0]);
}

// Leaves that stand for the dimensions of a separated leader.
class Leader : public KFS_Stream {
public:
    using KFS_Stream::KFS_Stream;
    M_Vector4T<double> GetVector4Ex(KFS_EvalData const& asked) const override
    {
        return {{0.5 * asked.time.value, 1.0, 2.0 * asked.time.value * asked.time.value, 0.0}};
    }
    KFS_Stream const* GetSeparationFollower(int dimension) const override
    {
        return dimension < static_cast<int>(followers.size()) ? followers[static_cast<std::size_t>(dimension)]
                                                              : nullptr;
    }
    void GetSeparationFollowers(std::vector<KFS_Stream const*>& found) const override { found = followers; }
    std::vector<KFS_Stream const*> followers;
};

TEST_F(Evaluate, SeparatedDimensionsAnswerFromTheirFollowers)
{
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_U8;
    Leader leader(3, 600, 0, 0, 7, 0, desc, nullptr, nullptr, false);
    TestStream x, y;
    x.Key(0, {10.0}).Key(100, {20.0});
    y.Key(0, {5.0});
    leader.followers = {x.get(), y.get()};
    double const own[3] = {1.0, 2.0, 3.0};
    T_Time const at{50, 600};
    ASSERT_EQ(0, KFS_InsertKeyF(&leader, nullptr, 1, own, KFS_Interp_Linear, KFS_Interp_Linear));
    leader.SetDimensionsSeparated(true);
    std::array<double, 3> value{};
    ASSERT_EQ(0, KFS_GetValueFPlus(&leader, &at, 0, value.data(), nullptr, nullptr));
    EXPECT_EQ(1.0, value[0]) << "without a parent it reads its own keys";
    BareGroup root;
    leader.SetParent(&root);
    value = {-1.0, -1.0, -1.0};
    unsigned char atKey = 9;
    ASSERT_EQ(0, KFS_GetValueFPlus(&leader, &at, 0, value.data(), &atKey, nullptr));
    EXPECT_EQ((std::array{15.0, 5.0, -1.0}), value) << "without a follower a place stays";
    EXPECT_EQ(9, atKey);
    leader.ForceInterpolateAtTime(at);  // whose buffer has to hold the followers' doubles, and not three bytes
    char** handle = nullptr;
    ASSERT_EQ(0, KFS_GetValuesFPlus(&leader, &at, &at, 2, 0, &handle));
    auto const* const values = reinterpret_cast<double const*>(*handle);
    EXPECT_EQ((std::vector{15.0, 5.0, 0.0, 20.0, 5.0, 0.0}), std::vector(values, values + 6));
    Q_FreeHandle(handle);

    // Its direction is their rates, and where all of them rest the way past the nearest time that has keys.
    leader.SetKFSFlags(static_cast<unsigned short>(leader.GetKFSFlags() | KFS_StreamFlag_Spatial));
    T_Time const late{5000, 600};
    struct Row {
        T_Time const* at;
        std::array<double, 3> way;
        int atKey;
    } const rows[] = {{&at, {60.0, 0.0, 0.0}, 0},
                      {nullptr, {60.0, 0.0, 0.0}, 1},
                      {&late, {1.0, 0.0, 2.0 * (101 * 101 - 99 * 99)}, 0}};
    for (Row const& row : rows) {
        ASSERT_EQ(0, KFS_GetSpaceTangent(&leader, row.at, 0, 0, value.data(), &atKey, nullptr));
        EXPECT_EQ(row.way, value);
        EXPECT_EQ(row.atKey, atKey);
    }
    leader.SetKFSFlags(static_cast<unsigned short>(leader.GetKFSFlags() & ~KFS_StreamFlag_Spatial));
}

TEST_F(Evaluate, ReadsAllocateNothing)
{
    TestStream plain({.dimension = 3});
    TestStream spatial({.dimension = 3, .spatial = true});
    for (int i = 0; i < 20; ++i) {
        plain.Key(i * 10, {1.0 * i, 2.0, 3.0}, i % 2 ? KFS_Interp_Spline : KFS_Interp_Linear);
        spatial.Key(i * 10, {1.0 * i, 2.0 * (i % 3), 3.0}, KFS_Interp_Spline);
    }
    plain.At(5);
    spatial.At(5);
    double value[3];
    Q_FailAllocation(1);
    for (int time = -5; time < 200; ++time) {
        T_Time const at{time, 600};
        ASSERT_EQ(0, KFS_GetValueFPlus(plain, &at, 0, value, nullptr, nullptr));
        ASSERT_EQ(0, KFS_GetValuePlus(spatial, &at, 0, value, nullptr, nullptr, nullptr, 0));
    }
    EXPECT_FALSE(Q_FailAllocationFired());
    Q_FailAllocation(0);
}

}  // namespace
