// What expressions can ask of streams: others' values, and the keys of their own, also beyond their ends.

#include "host/expressionengine_private.h"
#include "host/expressionmath_private.h"

#include "curves/derivatives.h"
#include "keystore/evaluate.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <cmath>
#include <string_view>

namespace kfshost {

namespace {

using Numbers = ExpressionEngine::Numbers;

ExpressionEngine& EngineOf(lua_State* lua)
{
    ExpressionEngine* const engine = LuaState::Of(lua).Engine();
    if (!engine) luaL_error(lua, "there are no streams here");
    return *engine;
}

double CheckSeconds(lua_State* lua, int index)
{
    double const seconds = CheckNumber(lua, index);
    luaL_argcheck(lua, std::isfinite(seconds), index, "isn't a time");
    return seconds;
}

// What the keys of the running expression's stream say at a time in seconds.
void PushKeys(lua_State* lua, ExpressionEngine& engine, double seconds)
{
    ExpressionEngine::Run const& run = engine.Current();
    Numbers values(run.Dimension());
    engine.ReadKeys(lua, ExpressionEngine::UnitsOf(seconds, *run.seen), values.data());
    PushNumbers(lua, values.data(), values.size());
}

int Stream(lua_State* lua)
{
    ExpressionEngine& engine = EngineOf(lua);
    std::size_t length = 0;
    char const* const path = luaL_checklstring(lua, 1, &length);
    ChargeNumbers(lua, 1);
    double const seconds = lua_isnoneornil(lua, 2) ? 0.0 : CheckSeconds(lua, 2);
    Numbers values;
    engine.ReadStream(lua, {path, length}, lua_isnoneornil(lua, 2) ? nullptr : &seconds, values);
    PushNumbers(lua, values.data(), values.size());
    return 1;
}

int At(lua_State* lua)
{
    PushKeys(lua, EngineOf(lua), CheckSeconds(lua, 1));
    return 1;
}

int Delay(lua_State* lua)
{
    ExpressionEngine& engine = EngineOf(lua);
    PushKeys(lua, engine, engine.Current().Seconds() - CheckSeconds(lua, 1));
    return 1;
}

int Random(lua_State* lua)
{
    double const time = lua_isnoneornil(lua, 2) ? EngineOf(lua).Current().Seconds() : CheckNumber(lua, 2);
    lua_pushnumber(lua, exprmath::Random(CheckNumber(lua, 1), time));
    return 1;
}

// The mean of what the keys say at times spread evenly over a window around a time, its ends included.
int Smooth(lua_State* lua)
{
    constexpr lua_Integer usualSamples = 9;
    constexpr lua_Integer mostSamples = 1000;
    ExpressionEngine& engine = EngineOf(lua);
    ExpressionEngine::Run const& run = engine.Current();
    double const window = CheckSeconds(lua, 1);
    ChargeNumbers(lua, 2);
    lua_Integer const samples = luaL_optinteger(lua, 2, usualSamples);
    luaL_argcheck(lua, samples >= 1 && samples <= mostSamples, 2, "isn't a number of samples from 1 to 1000");
    double const middle = lua_isnoneornil(lua, 3) ? run.Seconds() : CheckSeconds(lua, 3);
    Numbers sum(run.Dimension(), 0.0);
    Numbers one(run.Dimension());
    for (lua_Integer i = 0; i < samples; ++i) {
        double const place = samples == 1 ? 0.5 : static_cast<double>(i) / static_cast<double>(samples - 1);
        engine.ReadKeys(lua, ExpressionEngine::UnitsOf(middle + window * (place - 0.5), *run.seen), one.data());
        for (std::size_t d = 0; d < sum.size(); ++d) sum[d] += one[d];
    }
    for (double& number : sum) number /= static_cast<double>(samples);
    PushNumbers(lua, sum.data(), sum.size());
    return 1;
}

// ---- beyond the keys

enum class Beyond { Hold, Cycle, PingPong, Offset, Straight };
constexpr char const* BeyondNames[] = {"hold", "cycle", "pingpong", "offset", "straight", nullptr};

// A stream's keys, and what they mean before the first and after the last one. Times are units of the stream's scale.
class Repeated {
public:
    Repeated(lua_State* lua, ExpressionEngine& engine) : lua_(lua), engine_(engine), run_(engine.Current())
    {
        first_ = KeyTime(0);
        length_ = KeyTime(-1) - first_;
    }

    void Read(std::int64_t time, Beyond before, Beyond after, Numbers& values) const
    {
        std::int64_t const offset = time - first_;
        bool const isBefore = offset < 0;
        Beyond const beyond = isBefore ? before : after;
        if (length_ == 0 || beyond == Beyond::Hold || (offset >= 0 && offset <= length_)) {
            ReadKeys(std::clamp<std::int64_t>(offset, 0, length_), values);
            return;
        }
        if (beyond == Beyond::Straight) {
            GoOn(isBefore ? offset : offset - length_, isBefore, values);
            return;
        }
        std::int64_t const round = FloorOver(offset, length_);
        std::int64_t const inRound = offset - round * length_;
        bool const isBackward = beyond == Beyond::PingPong && round % 2 != 0;
        ReadKeys(isBackward ? length_ - inRound : inRound, values);
        if (beyond == Beyond::Offset) AddRounds(static_cast<double>(round), values);
    }

private:
    static std::int64_t FloorOver(std::int64_t a, std::int64_t b) { return a / b - (a % b < 0 ? 1 : 0); }

    // A constant is one key.
    std::int64_t KeyTime(int index) const
    {
        T_Time time{};
        if (run_.seen->HasNoKeys() || run_.stream->GetKeyCount() == 0) return 0;
        if (KFS_IndexToTime(run_.stream, index, &time) != 0) luaL_error(lua_, "the stream's keys can't be read");
        return time.value;
    }

    void ReadKeys(std::int64_t offset, Numbers& values) const
    {
        engine_.ReadKeys(lua_, static_cast<int>(first_ + offset), values.data());
    }

    void AddRounds(double rounds, Numbers& values) const
    {
        Numbers from(values.size());
        Numbers to(values.size());
        ReadKeys(0, from);
        ReadKeys(length_, to);
        for (std::size_t d = 0; d < values.size(); ++d) values[d] += rounds * (to[d] - from[d]);
    }

    // From the key at an end, as fast as the curve comes to it. Of a path that is the last unit of its way.
    void GoOn(std::int64_t units, bool isBefore, Numbers& values) const
    {
        std::int64_t const end = isBefore ? 0 : length_;
        Numbers rates(values.size());
        ReadKeys(end, values);
        T_Time const at{static_cast<int>(first_ + end), run_.seen->GetTimeScale()};
        double seconds = static_cast<double>(units) / run_.seen->GetTimeScale();
        if (run_.seen->IsSpatial()) {
            ReadKeys(isBefore ? 1 : length_ - 1, rates);
            for (std::size_t d = 0; d < rates.size(); ++d)
                rates[d] = isBefore ? rates[d] - values[d] : values[d] - rates[d];
            seconds = static_cast<double>(units);
        } else if (KFS_GetDeriv(run_.stream, &at, KFS_Deriv_Velocity, 0, KFS_EvalFlag_NoExpression, rates.data(),
                                nullptr, run_.bag, {}, {}) != 0) {
            luaL_error(lua_, "the stream's keys have no rate");
        }
        for (std::size_t d = 0; d < values.size(); ++d) values[d] += seconds * rates[d];
    }

    lua_State* lua_;
    ExpressionEngine& engine_;
    ExpressionEngine::Run const& run_;
    std::int64_t first_ = 0;
    std::int64_t length_ = 0;
};

int Extend(lua_State* lua)
{
    ExpressionEngine& engine = EngineOf(lua);
    ExpressionEngine::Run const& run = engine.Current();
    auto const before = static_cast<Beyond>(luaL_checkoption(lua, 1, nullptr, BeyondNames));
    auto const after =
        static_cast<Beyond>(luaL_checkoption(lua, 2, BeyondNames[static_cast<int>(before)], BeyondNames));
    int const time = lua_isnoneornil(lua, 3) ? run.time : ExpressionEngine::UnitsOf(CheckSeconds(lua, 3), *run.seen);
    Numbers values(run.Dimension());
    Repeated(lua, engine).Read(time, before, after, values);
    PushNumbers(lua, values.data(), values.size());
    return 1;
}

}  // namespace

void AddStreamFunctions(lua_State* lua)
{
    constexpr luaL_Reg functions[] = {{"stream", Stream}, {"at", At},         {"delay", Delay},  {"random", Random},
                                      {"smooth", Smooth}, {"extend", Extend}, {nullptr, nullptr}};
    luaL_setfuncs(lua, functions, 0);
}

}  // namespace kfshost
