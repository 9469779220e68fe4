// What expressions can call of the language's own libraries, and what stands in for the rest.
//
// Left out: whatever reaches files, code, metatables or other states; pcall, since an error is for the reader of the stream and not
// for the expression; pairs and next, whose order differs from run to run; sort, which draws; and patterns, which can take
// for ever inside a single call.

#include "host/expressionlua_private.h"
#include "host/expressionmath_private.h"

#include <algorithm>
#include <limits>
#include <string_view>

namespace kfshost {

namespace {

// Of reading a text as a number.
double StepsOfText(lua_State* lua, int index)
{
    constexpr double bytesOfStep = 16.0;
    return static_cast<double>(lua_rawlen(lua, index)) / bytesOfStep;
}

// Moves functions and numbers of a library into the table on top of the stack. The library itself is dropped.
void Take(lua_State* lua, lua_CFunction open, std::initializer_list<char const*> names)
{
    lua_pushcfunction(lua, open);
    lua_call(lua, 0, 1);
    for (char const* name : names) {
        lua_getfield(lua, -1, name);
        lua_setfield(lua, -3, name);
    }
    lua_pop(lua, 1);
}

// Goes on as the library's own function, which is kept with the one that stands in for it. Not by a call of Lua's, so that an
// error tells the line and the name that the text has. None of these functions keeps anything itself.
int CallOriginal(lua_State* lua)
{
    return lua_tocfunction(lua, lua_upvalueindex(1))(lua);
}

// Functions of the library's whose arguments from a place on, kept with them, are numbers.
int WithNumbers(lua_State* lua)
{
    ChargeNumbers(lua, static_cast<int>(lua_tointeger(lua, lua_upvalueindex(2))));
    return CallOriginal(lua);
}

void TakeWithNumbers(lua_State* lua, int first, std::initializer_list<char const*> names)
{
    for (char const* name : names) {
        lua_getfield(lua, -1, name);
        lua_pushinteger(lua, first);
        lua_pushcclosure(lua, WithNumbers, 2);
        lua_setfield(lua, -2, name);
    }
}

void Wrap(lua_State* lua, char const* name, lua_CFunction function)
{
    lua_getfield(lua, -1, name);
    lua_pushcclosure(lua, function, 1);
    lua_setfield(lua, -2, name);
}

void Add(lua_State* lua, std::initializer_list<luaL_Reg> functions)
{
    for (luaL_Reg const& function : functions) {
        lua_pushcfunction(lua, function.func);
        lua_setfield(lua, -2, function.name);
    }
}

// ---- basics

// What isn't a number is "nan" whichever sign a machine gives it.
void DropSignOfNan(lua_State* lua, int index)
{
    double const number = lua_type(lua, index) == LUA_TNUMBER ? lua_tonumber(lua, index) : 0.0;
    if (number == number) return;
    lua_pushnumber(lua, std::numeric_limits<double>::quiet_NaN());
    lua_replace(lua, index);
}

// As it stands in an error's text; of what has no text its kind, not the address.
int ToString(lua_State* lua)
{
    luaL_checkany(lua, 1);
    DropSignOfNan(lua, 1);
    switch (lua_type(lua, 1)) {
    case LUA_TNIL:
    case LUA_TBOOLEAN:
    case LUA_TNUMBER:
    case LUA_TSTRING: luaL_tolstring(lua, 1, nullptr); break;
    default: lua_pushstring(lua, luaL_typename(lua, 1)); break;
    }
    return 1;
}

// ---- math

using OneNumber = double (*)(double);
template <OneNumber Function>
int CallOne(lua_State* lua)
{
    lua_pushnumber(lua, Function(CheckNumber(lua, 1)));
    return 1;
}

int Atan(lua_State* lua)
{
    lua_pushnumber(lua, exprmath::Atan2(CheckNumber(lua, 1), OptNumber(lua, 2, 1.0)));
    return 1;
}

int Log(lua_State* lua)
{
    double const log = exprmath::Log(CheckNumber(lua, 1));
    lua_pushnumber(lua, lua_isnoneornil(lua, 2) ? log : log / exprmath::Log(CheckNumber(lua, 2)));
    return 1;
}

int Pow(lua_State* lua)
{
    lua_pushnumber(lua, exprmath::Pow(CheckNumber(lua, 1), CheckNumber(lua, 2)));
    return 1;
}

int Clamp(lua_State* lua)
{
    double const x = CheckNumber(lua, 1);
    double const low = CheckNumber(lua, 2);
    double const high = CheckNumber(lua, 3);
    lua_pushnumber(lua, x < low ? low : x > high ? high : x);
    return 1;
}

int Noise(lua_State* lua)
{
    lua_pushnumber(lua, exprmath::Noise(CheckNumber(lua, 1), OptNumber(lua, 2, 0.0)));
    return 1;
}

void AddMath(lua_State* lua)
{
    Take(lua, luaopen_math,
         {"abs", "ceil", "deg", "floor", "fmod", "huge", "max", "maxinteger", "min", "mininteger", "modf", "pi", "rad",
          "sqrt", "tointeger", "type", "ult"});
    TakeWithNumbers(lua, 1,
                    {"abs", "ceil", "deg", "floor", "fmod", "max", "min", "modf", "rad", "sqrt", "tointeger", "ult"});
    Add(lua, {{"sin", CallOne<exprmath::Sin>},
              {"cos", CallOne<exprmath::Cos>},
              {"tan", CallOne<exprmath::Tan>},
              {"asin", CallOne<exprmath::Asin>},
              {"acos", CallOne<exprmath::Acos>},
              {"atan", Atan},
              {"exp", CallOne<exprmath::Exp>},
              {"log", Log},
              {"pow", Pow}});
}

// ---- strings

// The library's own goes round as often as it is asked to, also with nothing to repeat.
int Repeat(lua_State* lua)
{
    std::size_t length = 0;
    std::size_t between = 0;
    luaL_checklstring(lua, 1, &length);
    ChargeNumbers(lua, 2);
    lua_Integer const times = luaL_checkinteger(lua, 2);
    luaL_optlstring(lua, 3, "", &between);
    if (length + between == 0) {
        lua_pushliteral(lua, "");
        return 1;
    }
    if (times > 0) LuaState::Of(lua).Charge(lua, static_cast<double>(times));
    return CallOriginal(lua);
}

// Without addresses, which differ from run to run. A format may have zero bytes.
int Format(lua_State* lua)
{
    std::size_t length = 0;
    char const* const text = luaL_checklstring(lua, 1, &length);
    std::string_view const format(text, length);
    for (std::size_t at = format.find('%'); at != format.npos; at = format.find('%', at + 1)) {
        at = format.find_first_not_of("-+ #0123456789.", at + 1);
        if (at == format.npos) break;
        if (format[at] == 'p') return luaL_argerror(lua, 1, "%p has no place here");
    }
    for (int i = 2; i <= lua_gettop(lua); ++i) {
        int const type = lua_type(lua, i);
        luaL_argexpected(lua, type == LUA_TNUMBER || type == LUA_TSTRING || type == LUA_TBOOLEAN || type == LUA_TNIL, i,
                         "number or string");
        DropSignOfNan(lua, i);
    }
    ChargeNumbers(lua, 1);
    return CallOriginal(lua);
}

// ---- tables

// These walk over a table from a place to another, which are their arguments from `Place` on, or over all of it.
template <int Place>
int WithRange(lua_State* lua)
{
    luaL_checktype(lua, 1, LUA_TTABLE);
    ChargeNumbers(lua, Place);
    double const first = luaL_optnumber(lua, Place, 1.0);
    double const last = luaL_optnumber(lua, Place + 1, static_cast<double>(lua_rawlen(lua, 1)));
    if (last > first) LuaState::Of(lua).Charge(lua, last - first);
    return CallOriginal(lua);
}

// These move what stands behind a place of a table, where their second argument of so many is one.
template <int Arguments>
int WithPlace(lua_State* lua)
{
    if (lua_istable(lua, 1) && lua_gettop(lua) >= Arguments) {
        ChargeNumbers(lua, 2);
        auto const length = static_cast<double>(lua_rawlen(lua, 1));
        double const moved = std::min(length, length - lua_tonumber(lua, 2));
        if (moved > 0.0) LuaState::Of(lua).Charge(lua, moved);
    }
    return CallOriginal(lua);
}

}  // namespace

void ChargeNumbers(lua_State* lua, int first)
{
    int const count = lua_gettop(lua) - first + 1;
    double steps = std::max(count, 0);
    for (int i = first; i < first + count; ++i)
        if (lua_type(lua, i) == LUA_TSTRING) steps += StepsOfText(lua, i);
    LuaState::Of(lua).Charge(lua, steps);
}

double CheckNumber(lua_State* lua, int index)
{
    if (lua_type(lua, index) == LUA_TSTRING) LuaState::Of(lua).Charge(lua, StepsOfText(lua, index));
    return luaL_checknumber(lua, index);
}

double OptNumber(lua_State* lua, int index, double otherwise)
{
    return lua_isnoneornil(lua, index) ? otherwise : CheckNumber(lua, index);
}

void AddBasicFunctions(lua_State* lua)
{
    Take(lua, luaopen_base, {"assert", "error", "ipairs", "select", "tonumber", "type"});
    TakeWithNumbers(lua, 1, {"select", "tonumber"});
    Add(lua, {{"tostring", ToString}});
}

// As math.sin and as sin.
void AddMathFunctions(lua_State* lua)
{
    lua_newtable(lua);
    AddMath(lua);
    MakeReadOnly(lua);
    lua_setfield(lua, -2, "math");
    AddMath(lua);
    Add(lua, {{"clamp", Clamp}, {"noise", Noise}});
}

void AddStringFunctions(lua_State* lua)
{
    lua_newtable(lua);
    Take(lua, luaopen_string, {"byte", "char", "format", "len", "lower", "rep", "reverse", "sub", "upper"});
    TakeWithNumbers(lua, 1, {"char"});
    TakeWithNumbers(lua, 2, {"byte", "sub"});
    Wrap(lua, "rep", Repeat);
    Wrap(lua, "format", Format);
    // Strings find these as s:rep(2), and nothing else: the library's own metatable goes.
    lua_pushliteral(lua, "");
    lua_createtable(lua, 0, 1);
    lua_pushvalue(lua, -3);
    lua_setfield(lua, -2, "__index");
    lua_setmetatable(lua, -2);
    lua_pop(lua, 1);
    MakeReadOnly(lua);
    lua_setfield(lua, -2, "string");
}

void AddTableFunctions(lua_State* lua)
{
    lua_newtable(lua);
    Take(lua, luaopen_table, {"concat", "insert", "remove", "unpack"});
    Wrap(lua, "concat", WithRange<3>);
    Wrap(lua, "unpack", WithRange<2>);
    Wrap(lua, "insert", WithPlace<3>);
    Wrap(lua, "remove", WithPlace<2>);
    MakeReadOnly(lua);
    lua_setfield(lua, -2, "table");
}

}  // namespace kfshost
