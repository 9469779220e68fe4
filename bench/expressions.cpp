// What a read of an expression costs beside the call of its function in a bare Lua, with the same arguments.

#include "bench/common.h"
#include "frame/services/strings.h"
#include "host/streambuilder.h"
#include "keystore/evaluate.h"
#include "overrides/streamexpression.h"

#include <benchmark/benchmark.h>

#include <lauxlib.h>
#include <lua.h>
#include <lualib.h>

#include <memory>
#include <string>

namespace {

constexpr int Frames = 4096;

// `time` alone; the value of one component; of three; and a loop.
constexpr char const* Texts[] = {"time * 2 + 1", "value * 2", "{value[3], value[2], value[1]}",
                                 "local s = 0 for i = 1, 20 do s = s + value * i end return s"};
constexpr short Dimensions[] = {1, 1, 3, 1};

struct Expression {
    explicit Expression(std::int64_t row) : text(Texts[row]), dimension(Dimensions[row])
    {
        Library();
        kfshost::StreamBuilder builder(dimension, 24, "bench");
        for (int time = 0; time <= Frames; time += 24) {
            double const value[] = {time * 0.5, 1.0, 2.0};
            builder.Append(time, value, KFS_Interp_Linear, KFS_Interp_Linear);
        }
        stream = builder.Take();
    }

    char const* text;
    short dimension;
    std::unique_ptr<KFS_Stream> stream;
};

void ReadAll(benchmark::State& state, KFS_Stream const& stream)
{
    double value[3] = {};
    int time = 0;
    for (auto _ : state) {
        T_Time const at{time, 24};
        if (KFS_GetValueFPlus(&stream, &at, 0, value, nullptr, nullptr) != 0) state.SkipWithError("no value");
        benchmark::DoNotOptimize(value);
        time = (time + 1) % Frames;
    }
}

void Ours(benchmark::State& state)
{
    Expression const expression(state.range(0));
    KFS_SetStreamExpression(expression.stream.get(), Q_AsciiToUTF16String(expression.text));
    ReadAll(state, *expression.stream);
}

void OursInRender(benchmark::State& state)
{
    Expression const expression(state.range(0));
    KFS_SetStreamExpression(expression.stream.get(), Q_AsciiToUTF16String(expression.text));
    Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
    ReadAll(state, *expression.stream);
}

// The function alone, as it is compiled there; a value of several components is a table.
void Yardstick(benchmark::State& state)
{
    Expression const expression(state.range(0));
    std::unique_ptr<lua_State, void (*)(lua_State*)> const lua(luaL_newstate(), lua_close);
    lua_State* const l = lua.get();
    std::string const text = expression.text;
    std::string const prefix = "local time,frame,value=...";
    bool const isChunk = text.find("return") != std::string::npos;
    if (luaL_loadstring(l, (prefix + (isChunk ? ";" : "return ") + text).c_str()) != LUA_OK)
        state.SkipWithError("not compiled");
    double value[3] = {};
    int time = 0;
    for (auto _ : state) {
        value[0] = time;
        lua_pushvalue(l, 1);
        lua_pushnumber(l, time / 24.0);
        lua_pushnil(l);
        if (expression.dimension == 1) {
            lua_pushnumber(l, value[0]);
        } else {
            lua_createtable(l, 3, 0);
            for (int i = 0; i < 3; ++i) {
                lua_pushnumber(l, value[i]);
                lua_rawseti(l, -2, i + 1);
            }
        }
        if (lua_pcall(l, 3, 1, 0) != LUA_OK) state.SkipWithError("not run");
        if (expression.dimension == 1) {
            value[0] = lua_tonumber(l, -1);
        } else {
            for (int i = 0; i < 3; ++i) {
                lua_rawgeti(l, -1, i + 1);
                value[i] = lua_tonumber(l, -1);
                lua_pop(l, 1);
            }
        }
        lua_pop(l, 1);
        benchmark::DoNotOptimize(value);
        time = (time + 1) % Frames;
    }
}

BENCHMARK(Ours)->Name("expression/ours")->DenseRange(0, 3);
BENCHMARK(OursInRender)->Name("expression_in_render/ours")->DenseRange(0, 3);
BENCHMARK(Yardstick)->Name("expression/yardstick")->DenseRange(0, 3);
BENCHMARK(Yardstick)->Name("expression_in_render/yardstick")->DenseRange(0, 3);

}  // namespace
