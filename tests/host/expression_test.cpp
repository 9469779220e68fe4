#include "host/expression.h"

#include "frame/services/strings.h"
#include "host/expressionmath_private.h"
#include "host/kinds.h"
#include "host/projectfile.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"
#include "keystore/expstate.h"
#include "overrides/parambag.h"
#include "overrides/streamexpression.h"
#include "tests/host/hosttest.h"

#include <boost/make_shared.hpp>

#include <cmath>
#include <numbers>

namespace {

using kfshost::Rational;

// A project whose node "Box" moves: x = 0, 24, 12 at 0 s, 1 s and 2 s, splines for a scale in three components, and the node
// "Tag", which has a number for each of the frames. In 24 frames a second.
class Expressions : public HostTest {
protected:
    Expressions()
    {
        kfshost::Scene scene;
        scene.name = "test";
        scene.timeScale = 24;
        Add(scene, "Box", kfshost::StreamKind::Weights, {{0, {0.0}}, {24, {24.0}}, {48, {12.0}}}, KFS_Interp_Linear);
        Add(scene, "Box", kfshost::StreamKind::Scale, {{0, {1.0, 2.0, 3.0}}, {30, {5.0, -1.0, 3.0}}},
            KFS_Interp_Spline);
        Add(scene, "Tag", kfshost::StreamKind::Weights, {{0, {7.0}}, {48, {55.0}}}, KFS_Interp_Linear);
        Add(scene, "Loop", kfshost::StreamKind::Weights, {{0, {1.0}}}, KFS_Interp_Hold);
        tree = kfshost::MakeTree(std::move(scene));
        kfshost::PrepareExpressions(*tree);
        for (kfshost::ListedStream const& listed : kfshost::ListStreams(*tree))
            streams.push_back(const_cast<KFS_Stream*>(listed.stream));
        box = streams[0], scale = streams[1], tag = streams[2], loop = streams[3];
        // The library lists leaves by kind, and of one node the scale comes before the weights.
        if (box->GetDimension() != 1) std::swap(box, scale);
    }

    struct Key {
        int time;
        std::vector<double> value;
    };
    static void Add(kfshost::Scene& scene, char const* node, kfshost::StreamKind kind, std::vector<Key> const& keys,
                    KFS_Interp interp)
    {
        auto const dimension = static_cast<short>(keys.front().value.size());
        kfshost::StreamBuilder builder(dimension, 24, node);
        for (Key const& key : keys) builder.Append(key.time, key.value.data(), interp, interp);
        kfshost::StreamItem item;
        item.animation = "a";
        item.node = node;
        item.kind = kind;
        item.components = kfshost::UsualComponents(kind, static_cast<std::size_t>(dimension));
        item.stream = builder.Take();
        scene.streams.push_back(std::move(item));
    }

    static void Set(KFS_Stream* stream, std::string const& text)
    {
        KFS_SetStreamExpression(stream, Q_MBToUTF16String(text));
    }
    std::vector<double> Read(KFS_Stream const* stream, int time, int flags = 0, KFS_ParamBag const* bag = nullptr)
    {
        std::vector<double> values(static_cast<std::size_t>(stream->GetDimension()));
        T_Time const at{time, 24};
        EXPECT_EQ(0, KFS_GetValueFPlus(stream, &at, flags, values.data(), nullptr, bag));
        return values;
    }
    // What the only failure since the last question says; empty where there was none.
    std::string Failure()
    {
        auto const errors = kfshost::TakeExpressionErrors();
        return errors.empty() ? "" : errors.front().text;
    }

    std::unique_ptr<kfshost::SceneGroup> tree;
    std::vector<KFS_Stream*> streams;
    KFS_Stream *box = nullptr, *scale = nullptr, *tag = nullptr, *loop = nullptr;
};

// Of the stream "Box" at frame 12, where its keys say 12, and beside it.
TEST_F(Expressions, GiveWhatTheyCompute)
{
    struct Row {
        char const* text;
        int time;
        double value;
    };
    constexpr Row rows[] = {
        {"3", 0, 3},
        {"value * 2", 12, 24},
        {"value", 36, 18},
        {"time", 12, 0.5},
        {"frame", 12, 12},
        {"local x = value\nreturn x + 1", 12, 13},
        {"-- a note\nvalue", 12, 12},
        {"if time > 1 then return 1 end return 2", 12, 2},
        {"local s = 0 for i = 1, 10 do s = s + i end return s", 0, 55},
        {"at(1.5)", 0, 18},
        {"delay(0.25)", 12, 6},
        {"smooth(0.5, 3)", 24, (18 + 24 + 21) / 3.0},
        {"stream('a/Tag/weights')", 12, 19},
        {"stream('a/Tag/weights', 2)", 12, 55},
        {"stream('a/Tag/weights', time - 0.25) - value", 12, 1},
        {"stream('a/Box/scale').y", 0, 2},
        {"stream('a/Box/scale')[3]", 17, 3},
        {"extend('cycle')", 48 + 12, 12},
        {"extend('cycle')", -36, 12},
        {"extend('hold', 'cycle')", -36, 0},
        {"extend('pingpong')", 48 + 12, 18},
        {"extend('pingpong')", -12, 12},
        {"extend('pingpong')", 96 + 12, 12},
        {"extend('offset')", 48 + 12, 24},
        {"extend('offset')", -36, 0},
        {"extend('straight')", 72, 0},
        {"extend('straight')", -12, -12},
        {"extend('straight', 'hold')", 72, 12},
        {"extend('offset', 'cycle', 4.25)", 0, 6},
        {"lerp(10, 20, 0.25)", 0, 12.5},
        {"clamp(value, 0, 5)", 12, 5},
        {"linear(time, 0, 1, 100, 200)", 12, 150},
        {"linear(time, 0, 1, 100, 200)", 99, 200},
        {"ease(time, 0, 1, 0, 32)", 6, 5},
        {"length(vec(3, 4))", 0, 5},
        {"dot(vec(1, 2), vec(3, 4))", 0, 11},
        {"(vec(1, 2) * vec(3, 4) + 1 - {1, 1})[2] / 2", 0, 4},
        {"normalize(vec(3, 4)).y", 0, 0.8},
        {"max(1, 5, 3) + floor(2.5) + math.abs(-1)", 0, 8},
        {"pow(2, 10) + sqrt(9) + 7 // 2 + 7 % 4", 0, 1033},
        {"#tostring(12) + #string.rep('ab', 3) + #('x'):upper() + #string.format('%3d', 1)", 0, 12},
        {"random(1, 2) == random(1, 2) and random(1, 2) ~= random(2, 2) and random(1) >= 0 and 1 or 0", 0, 1},
        {"noise(0.5) == noise(0.5) and abs(noise(1.5) - noise(1.5 + 1e-9)) < 1e-6 and 1 or 0", 0, 1},
        {"type(pairs) == 'nil' and type(type) == 'function' and 1", 0, 1},
        {"select('#', table.unpack({1, 2, 3}))", 0, 3},
        {"(tostring(-(0/0)) .. string.format(' %g', -(0/0))) == 'nan nan' and 1", 0, 1},
        {"local t = {} for i = 1, 5000 do table.insert(t, i) end return #t", 0, 5000},
        {"atan(-0.0, -1) == -pi and atan(0.0, -1) == pi and 1", 0, 1},
        {"pow(2, -1030) * pow(2, 1000) * pow(2, 30)", 0, 1},
    };
    for (Row const& row : rows) {
        Set(box, row.text);
        EXPECT_DOUBLE_EQ(row.value, Read(box, row.time)[0]) << row.text;
        EXPECT_EQ("", Failure()) << row.text;
    }
    Set(scale, "value * 2 + vec(1, 0, 0)");
    EXPECT_EQ((std::vector<double>{3.0, 4.0, 6.0}), Read(scale, 0));
    Set(scale, "{value.x, time, frame}");
    EXPECT_EQ((std::vector<double>{1.0, 0.0, 0.0}), Read(scale, 0));
}

// Those of all machines; written down from this one, where they agree with the C library's to a few units in the last place.
TEST_F(Expressions, HaveMathematicsOfTheirOwn)
{
    namespace own = kfshost::exprmath;
    auto const near = [](double expected, double value) {
        EXPECT_NEAR(expected, value, 1e-14 * std::max(1.0, std::abs(expected)));
    };
    for (double x = -12.0; x < 12.0; x += 0.0625) {
        near(std::sin(x), own::Sin(x));
        near(std::cos(x), own::Cos(x));
        near(std::exp(x), own::Exp(x));
        near(std::atan2(x, 0.3), own::Atan2(x, 0.3));
        near(std::atan2(0.3, x), own::Atan2(0.3, x));
        if (std::abs(x) > 1e-9) near(std::log(std::abs(x)), own::Log(std::abs(x)));
        near(std::pow(std::abs(x), 2.5), own::Pow(std::abs(x), 2.5));
        if (std::abs(x) <= 1.0) near(std::asin(x), own::Asin(x));
        if (std::abs(x) <= 1.0) near(std::acos(x), own::Acos(x));
    }
    near(std::numbers::pi, own::Atan2(0.0, -1.0));
    EXPECT_TRUE(std::isnan(own::Sin(INFINITY)) && std::isnan(own::Log(-1.0)) && std::isnan(own::Pow(-1.0, 0.5)));
    EXPECT_EQ(0.0, own::Exp(-1e9));
    EXPECT_EQ(0x1.0e229a43d2c8p-3, own::Random(1.0, 2.0));
    EXPECT_EQ(0x1.955c145e0c254p-1, own::Noise(2.25, 3.0));
    EXPECT_EQ(own::Random(0.0, 1.0), own::Random(-0.0, 1.0));
}

// Each with a part of what is said, and the line.
TEST_F(Expressions, SayWhatIsWrong)
{
    struct Row {
        char const* text;
        char const* error;
    };
    constexpr Row rows[] = {
        {"value *", "line 1: unexpected symbol near <eof>"},
        {"local x = 1\nreturn x x", "line 2: "},
        {"1 2", "line 1: "},
        {"nothing", "gives a nil in place of a number"},
        {"vec(1)", "gives a table in place of a number"},
        {"'1'", "gives a string in place of a number"},
        {"0/0", "gives a number that isn't finite"},
        {"1/0", "gives a number that isn't finite"},
        {"local x", "gives a nil in place of a number"},
        {"value + missing", "line 1: attempt to perform arithmetic on a nil value (global 'missing')"},
        {"\n\nvalue.x.y", "line 3: attempt to index a"},
        {"stream('a/none')", "line 1: there is no stream \"a/none\""},
        {"stream('a/Box/weights')", "line 1: reads itself: a/Box/weights -> a/Box/weights"},
        {"stream('a/Box/weights', time - 1)", "reads through more than 64 expressions: "},
        {"at(0/0)", "isn't a time"},
        {"extend('sideways')", "invalid option 'sideways'"},
        {"smooth(1, 0)", "isn't a number of samples"},
        {"vec(1, 2) + vec(1, 2, 3)", "vectors of 2 and 3 components"},
        {"error({})", "error with a table in place of a text"},
        {"error('told')", "line 1: told"},
        {"assert(false, 'told')", "told"},
        {"\ntable.insert({}, 5, 1)", "line 2: bad argument #2 to 'insert'"},
        {"x = 1", "only local variables can be set"},
        {"math.pi = 3", "only local variables can be set"},
        {"string.rep = nil return 1", "only local variables can be set"},
        {"table.insert(math, 1)", "only local variables can be set"},
        {"('').rep = 1", "attempt to index a string value"},
        {"_ENV.x", "_ENV can't be used"},
        {"error('expression:99999999999999: told', 0)", "expression:99999999999999: told"},
    };
    for (Row const& row : rows) {
        Set(box, row.text);
        EXPECT_EQ(12.0, Read(box, 12)[0]) << row.text;  // the keys answer
        std::string const told = Failure();
        EXPECT_NE(std::string::npos, told.find(row.error)) << row.text << ": " << told;
    }
    Set(scale, "{1, 2}");
    EXPECT_EQ(3.0, Read(scale, 0)[2]);
    EXPECT_EQ("gives a table of 2 in place of a table of 3 numbers", Failure());
    Set(scale, "{1, 2, 'x'}");
    EXPECT_EQ(3.0, Read(scale, 0)[2]);
    EXPECT_EQ("gives a table with a string in place of a table of 3 numbers", Failure());
}

// What would take for ever, eat memory, or get out. All of it is an error of the expression, and what comes after it runs.
TEST_F(Expressions, AreKeptInside)
{
    constexpr char const* rows[] = {
        // time
        "while true do end return 1",
        "repeat local x = 1 until false",
        "for i = 1, 1e18 do end return 1",
        "for i = 1, 9 do for j = 1, 99999 do for k = 1, 999 do end end end return 1",
        "::again:: goto again",
        "local function f() return f() end return f()",
        "local s = 0 for i = 1, 1e9 do s = s + at(i) end return s",
        "for i = 1, 1e9 do stream('a/Tag/weights') end return 1",
        "for i = 1, 1e9 do local x = smooth(1, 1000) end return 1",
        "#string.rep('', 1e15, '') + #string.rep('x', 1e15)",
        "local s = string.rep('x', 2^19) local t = string.rep('x', 2^19) for i = 1, 1e9 do local b = s == t end return "
        "1",
        "local t = {} for i = 1, 2e4 do t[i] = i end for i = 1, 1e9 do table.insert(t, 1, 0) table.remove(t, 1) end",
        "for i = 1, 1e9 do local x = select(1, table.unpack({}, 1, 1e5)) end return 1",
        // numbers that are long texts, and orders of such
        "local s = ('9'):rep(900000) while true do tonumber(s) end",
        "local s = ('9'):rep(900000) while true do local x = sin(s) + floor(s) + noise(1, s) end",
        "local s = ('9'):rep(900000) local t = {} for i = 1, 5000 do t[i] = s end return #vec(table.unpack(t))",
        "local s = ('9'):rep(900000) while true do for i = 1, s do break end end",
        "for i = 1, 9e6 do end local s, t = ('\\0'):rep(90000), ('\\0'):rep(90001) while true do local x = s < t end",
        "for i = 1, 9e6 do end local t = {} for i = -999, 0 do t[i] = '' end while true do table.concat(t, '', -999, "
        "0) end",
        // memory
        "string.rep('x', 1e9)",
        "string.rep('x', 1e5, string.rep('y', 1e5))",
        "local s = 'x' while true do s = s .. s end",
        "local t = {} for i = 1, 1e9 do t[i] = {} end return 1",
        "local t = {} for i = 1, 1e9 do t['k' .. i] = i end return 1",
        "local function f(n) return 1 + f(n + 1) end return f(1)",
        "local f f = function(...) return f(1, ...) end return f()",
        "table.unpack({}, 1, 1e8)",
        "table.concat({}, '', 1, 1e15)",
        "local s = string.rep('x', 1e6) for i = 1, 1e9 do local u = s:upper() .. i end return 1",
        "('x'):rep(1e6):byte(1, -1)",
        "string.format('%99999d', 1)",
        // errors within errors
        "error(nil)",
        "error(error)",
        "error(string.rep('x', 1e6))",
        "local t <close> = {} return 1",
        "assert(nil, {})",
        // ways out
        "os.exit(1)",
        "io.open('/')",
        "load('return 1')()",
        "loadstring('return 1')()",
        "dofile('x')",
        "require('os')",
        "debug.getregistry()",
        "package.loaded",
        "collectgarbage('stop')",
        "coroutine.wrap(function() while true do end end)()",
        "pcall(error)",
        "xpcall(error, error)",
        "setmetatable({}, {__gc = error})",
        "getmetatable('').__index.rep",
        "rawset(math, 'pi', 3)",
        "string.dump(function() end)",
        "string.gsub('x', '.', '')",
        "('x'):find('(.-)*')",
        "('').format('%p', {})",
        "('').format('\\0%p', 'a text of more than forty characters, so that it has its own place')",
        "('').format('%s', {})",
        "next(math)",
        "math.random()",
        "\x1bLua",
        "print(1)",
        "tostring(print) + 1",
        "_G.x",
    };
    for (char const* row : rows) {
        Set(box, row);
        EXPECT_EQ(12.0, Read(box, 12)[0]) << row;
        EXPECT_NE("", Failure()) << row;
        Set(tag, "value + 1");
        EXPECT_EQ(20.0, Read(tag, 12)[0]) << "after " << row;
    }
    // What a read may use doesn't depend on what others left, nor on what is compiled meanwhile.
    auto const holding = [](int pieces, std::string const& result) {
        return "local t = {} for i = 1, " + std::to_string(pieces) +
               " do t[i] = ('b'):rep(32768 - 40 - i) end return " + result;
    };
    for (int const pieces : {60, 90, 60, 90}) {
        Set(box, holding(pieces, "#t"));
        EXPECT_EQ(pieces == 60 ? 60.0 : 12.0, Read(box, 12)[0]);
        EXPECT_EQ(pieces == 60 ? "" : "needs too much memory", Failure());
    }
    std::string names;
    for (int i = 10000; i < 16000; ++i) names += "'" + std::to_string(i) + "',";
    Set(tag, "if time < 0 then return {" + names + "} end return value");
    Set(box, holding(60, "stream('a/Tag/weights')"));
    EXPECT_EQ(19.0, Read(box, 12)[0]);
    EXPECT_EQ("", Failure());
    // Nothing but values comes out of a read, and nothing stays.
    Set(box, "type(string.format) == 'function' and tostring({}) == 'table' and tostring(sin) == 'function' and 5");
    EXPECT_EQ(5.0, Read(box, 0)[0]);
    std::string deep = "value";
    for (int i = 0; i < 5000; ++i) deep = '(' + deep + ')';
    for (std::string const& text : {deep, std::string(70000, ' ') + '1'}) {
        Set(box, text);
        EXPECT_EQ(12.0, Read(box, 12)[0]);
        EXPECT_NE("", Failure());
    }
}

TEST_F(Expressions, ThatAskForTheKeysAnswerTheirBits)
{
    for (KFS_Stream* const stream : streams) {
        for (char const* text : {"value", "at(time)", "extend('hold')"}) {
            Set(stream, text);
            for (int time = -5; time < 60; ++time) {
                auto const keys = Read(stream, time, KFS_EvalFlag_NoExpression);
                EXPECT_EQ(keys, Read(stream, time)) << text;
                T_Time const at{time, 24};
                std::vector<double> external(keys.size());
                ASSERT_EQ(0, KFS_GetValuePlus(stream, &at, 0, external.data(), nullptr, nullptr, nullptr, 0));
                EXPECT_EQ(keys, external);
            }
        }
        Set(stream, "");
    }
    EXPECT_EQ("", Failure());
}

TEST_F(Expressions, OfChainsFailTogetherAndKeepTheirPlaces)
{
    Set(box, "stream('a/Tag/weights') * 2");
    Set(tag, "stream('a/Loop/weights') + 1");
    EXPECT_EQ(4.0, Read(box, 12)[0]);
    std::set<int> ids;
    box->GetExpressionDependencyIds(ids);
    ASSERT_EQ(1u, ids.size());
    EXPECT_EQ("a/Tag/weights", kfshost::PathOfDependency(*tree, *ids.begin()));

    Set(box, "stream('a/Tag/weights') * 2");  // the same, which has forgotten them
    Read(box, 12);
    box->GetExpressionDependencyIds(ids);
    EXPECT_EQ(1u, ids.size());

    Set(loop, "\nstream('a/Box/weights')");
    EXPECT_EQ(12.0, Read(box, 12)[0]);
    auto errors = kfshost::TakeExpressionErrors();
    ASSERT_EQ(3u, errors.size());
    for (auto const& error : errors) {
        EXPECT_EQ("reads itself: a/Box/weights -> a/Tag/weights -> a/Loop/weights -> a/Box/weights", error.shortText);
        EXPECT_EQ(error.stream == loop ? 2 : 1, error.line);
    }
    kfshost::TellExpressionErrors(errors);
    EXPECT_TRUE(box->HasExpressionError() && !box->HasActiveExpression());
    EXPECT_EQ(2, KFS_GetStreamExprErrorLineNum(loop));
    EXPECT_EQ(12.0, Read(box, 12)[0]);
    EXPECT_EQ("", Failure());  // it isn't tried again
    ASSERT_EQ(0, KFS_SetStreamExprFlags(box, KFS_ExprFlag_Disabled, 0));
    EXPECT_EQ(12.0, Read(box, 12)[0]);
    EXPECT_EQ("line 1: the expression of \"a/Tag/weights\" is in error", Failure());

    // What is wrong is an inner one's; what is too much is told of the one that was asked.
    Set(loop, "1 + nil");
    Set(tag, "stream('a/Loop/weights')");
    Set(box, "stream('a/Tag/weights')");
    Read(box, 12);
    errors = kfshost::TakeExpressionErrors();
    ASSERT_EQ(3u, errors.size());
    EXPECT_EQ(loop, errors.front().stream);
    EXPECT_EQ(box, errors.back().stream);
    Set(loop, "while true do end");
    Set(tag, "stream('a/Loop/weights')");
    Set(box, "stream('a/Tag/weights')");
    Read(box, 12);
    errors = kfshost::TakeExpressionErrors();
    ASSERT_EQ(1u, errors.size());
    EXPECT_EQ(box, errors.front().stream);
    EXPECT_EQ("runs for too long", errors.front().shortText);

    // Who looks for errors, and who asks for quiet, isn't told.
    {
        auto const* const state =
            dynamic_cast<KFS_ExpState const*>(Q_RenderContext::PeekCurrent()->PeekState(KFS_ExpState::S_StateName));
        KFS_DetectExpressionErrors const detecting(state);
        Read(box, 12);
        EXPECT_EQ(1, state->errorCount);
    }
    box->SetExpressionErrorsAreQuiet(true);
    Read(box, 12);
    EXPECT_EQ("", Failure());
}

TEST_F(Expressions, HoldToOverridesDisabledFlagsAndTheTreeAsItIs)
{
    Set(box, "stream('a/Tag/weights') + value");
    Set(tag, "value * 100");
    EXPECT_EQ(1912.0, Read(box, 12)[0]);
    KFS_ParamBag bag;
    bag.AddOverride(tag,
                    boost::make_shared<KFS_StreamOverride>(tag, KFS_OverrideValue(std::vector<double>{1.5}), false));
    EXPECT_EQ(13.5, Read(box, 12, 0, &bag)[0]);
    EXPECT_EQ(1.5, Read(tag, 12, 0, &bag)[0]);  // in place of the expression too
    ASSERT_EQ(0, KFS_SetStreamExprFlags(tag, KFS_ExprFlag_Disabled, KFS_ExprFlag_Disabled));
    EXPECT_EQ(31.0, Read(box, 12)[0]);

    double numbers[1] = {};
    T_Time const at{12, 24};
    EXPECT_EQ(0, box->EvaluateExpression(&at, numbers, nullptr, nullptr));
    EXPECT_EQ(31.0, numbers[0]);
    EXPECT_EQ(1, tag->EvaluateExpression(&at, numbers, nullptr, nullptr));

    // A stream that is gone is no more found, and another in its place is.
    auto& node = dynamic_cast<kfshost::NodeGroup&>(*tag->GetParent());
    auto taken = node.TakeChannel(kfshost::StreamKind::Weights);
    EXPECT_EQ(12.0, Read(box, 12)[0]);
    EXPECT_EQ("line 1: there is no stream \"a/Tag/weights\"", Failure());
    taken.reset();
    kfshost::StreamBuilder builder(1, 24, "Tag");
    double const five = 5.0;
    builder.Append(0, &five, KFS_Interp_Hold, KFS_Interp_Hold);
    node.PutChannel(kfshost::StreamKind::Weights, builder.Take());
    EXPECT_EQ(17.0, Read(box, 12)[0]);
}

// A render's own context has an engine and failures of its own, and reads the texts that its copies have.
TEST_F(Expressions, InARendersContextStayWithIt)
{
    Set(box, "stream('a/Tag/weights') + 1");
    auto const render = kfshost::MakeRenderContext(true);
    auto const readInRender = [&](KFS_Stream const* stream) {
        Q_ScSetCurrentRenderContext const current(render);
        return Read(stream, 12)[0];
    };
    EXPECT_EQ(20.0, readInRender(box));
    Set(box, "value");
    EXPECT_EQ(12.0, Read(box, 12)[0]);
    EXPECT_EQ(20.0, readInRender(box));
    Set(loop, "nil");
    EXPECT_EQ(1.0, readInRender(loop));
    EXPECT_EQ("", Failure());
    Q_ScSetCurrentRenderContext const current(render);
    EXPECT_EQ("gives a nil in place of a number", Failure());
}

TEST_F(Expressions, AreSavedWithTheProject)
{
    Set(box, "frame + 0 -- \xc3\xa4\xe2\x82\xac");
    Set(tag, "value");
    ASSERT_EQ(0, KFS_SetStreamExprFlags(tag, 0xFF, KFS_ExprFlag_Disabled | 0x10));
    auto const bytes = kfshost::SaveProjectToMemory(*tree, "test");
    auto const loaded = kfshost::LoadProjectFromMemory(bytes, "test");
    auto const listed = kfshost::ListStreams(*loaded);
    ASSERT_EQ(streams.size(), listed.size());
    for (std::size_t i = 0; i < listed.size(); ++i) {
        EXPECT_EQ(KFS_GetStreamExpression(streams[i]), KFS_GetStreamExpression(listed[i].stream));
        EXPECT_EQ(KFS_GetStreamExprFlags(streams[i]), KFS_GetStreamExprFlags(listed[i].stream));
        EXPECT_EQ(Read(streams[i], 13), Read(listed[i].stream, 13));
    }
    EXPECT_EQ(bytes, kfshost::SaveProjectToMemory(*loaded, "test"));
}

}  // namespace
