// What expressions can call of the language's own libraries, and what stands in for the rest.
//
// Left out: whatever reaches files, code, metatables or other states; pcall, since an error is for the reader of the stream and not
// for the expression; pairs and next, whose order differs from run to run; sort, which draws; and patterns, which can take
// for ever inside a single call.

#include "host/expressionlua_private.h"
#include "host/expressionmath_private.h"

#include <cmath>
#include <cstring>

namespace kfshost {

namespace {

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

void Add(lua_State* lua, std::initializer_list<luaL_Reg> functions)
{
    for (luaL_Reg const& function : functions) {
        lua_pushcfunction(lua, function.func);
        lua_setfield(lua, -2, function.name);
    }
}

// ---- basics

// As it stands in an error's text; of what has no text its kind, not the address.
int ToString(lua_State* lua)
{
    luaL_checkany(lua, 1);
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
    lua_pushnumber(lua, Function(luaL_checknumber(lua, 1)));
    return 1;
}

int Atan(lua_State* lua)
{
    lua_pushnumber(lua, exprmath::Atan2(luaL_checknumber(lua, 1), luaL_optnumber(lua, 2, 1.0)));
    return 1;
}

int Log(lua_State* lua)
{
    double const log = exprmath::Log(luaL_checknumber(lua, 1));
    lua_pushnumber(lua, lua_isnoneornil(lua, 2) ? log : log / exprmath::Log(luaL_checknumber(lua, 2)));
    return 1;
}

int Pow(lua_State* lua)
{
    lua_pushnumber(lua, exprmath::Pow(luaL_checknumber(lua, 1), luaL_checknumber(lua, 2)));
    return 1;
}

int Clamp(lua_State* lua)
{
    double const x = luaL_checknumber(lua, 1);
    double const low = luaL_checknumber(lua, 2);
    double const high = luaL_checknumber(lua, 3);
    lua_pushnumber(lua, x < low ? low : x > high ? high : x);
    return 1;
}

int Noise(lua_State* lua)
{
    lua_pushnumber(lua, exprmath::Noise(luaL_checknumber(lua, 1), luaL_optnumber(lua, 2, 0.0)));
    return 1;
}

void AddMath(lua_State* lua)
{
    Take(lua, luaopen_math,
         {"abs", "ceil", "deg", "floor", "fmod", "huge", "max", "maxinteger", "min", "mininteger", "modf", "pi", "rad",
          "sqrt", "tointeger", "type", "ult"});
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

// Goes on as the library's own function, which is kept with the one that stands in for it. Not by a call of Lua's, so that an
// error tells the line and the name that the text has. None of these functions keeps anything itself.
int CallOriginal(lua_State* lua)
{
    return lua_tocfunction(lua, lua_upvalueindex(1))(lua);
}

// The library's own goes round as often as it is asked to, also with nothing to repeat.
int Repeat(lua_State* lua)
{
    std::size_t length = 0;
    std::size_t between = 0;
    luaL_checklstring(lua, 1, &length);
    lua_Integer const times = luaL_checkinteger(lua, 2);
    luaL_optlstring(lua, 3, "", &between);
    if (length + between == 0) {
        lua_pushliteral(lua, "");
        return 1;
    }
    if (times > 0) LuaState::Of(lua).Charge(lua, static_cast<double>(times));
    return CallOriginal(lua);
}

// Without addresses, which differ from run to run.
int Format(lua_State* lua)
{
    char const* format = luaL_checkstring(lua, 1);
    while ((format = std::strchr(format, '%')) != nullptr) {
        format += 1 + std::strspn(format + 1, "-+ #0123456789.");
        if (*format == 'p') return luaL_argerror(lua, 1, "%p has no place here");
        if (*format != '\0') ++format;
    }
    for (int i = 2; i <= lua_gettop(lua); ++i) {
        int const type = lua_type(lua, i);
        luaL_argexpected(lua, type == LUA_TNUMBER || type == LUA_TSTRING || type == LUA_TBOOLEAN || type == LUA_TNIL, i,
                         "number or string");
    }
    return CallOriginal(lua);
}

void Wrap(lua_State* lua, char const* name, lua_CFunction function)
{
    lua_getfield(lua, -1, name);
    lua_pushcclosure(lua, function, 1);
    lua_setfield(lua, -2, name);
}

// ---- tables

// These walk over all of a table inside one call.
int WithWalk(lua_State* lua)
{
    if (lua_istable(lua, 1)) LuaState::Of(lua).Charge(lua, static_cast<double>(lua_rawlen(lua, 1)));
    return CallOriginal(lua);
}

// This one over as much as it is asked for.
int Unpack(lua_State* lua)
{
    luaL_checktype(lua, 1, LUA_TTABLE);
    double const first = luaL_optnumber(lua, 2, 1.0);
    double const last = luaL_optnumber(lua, 3, static_cast<double>(lua_rawlen(lua, 1)));
    if (last > first) LuaState::Of(lua).Charge(lua, last - first);
    return CallOriginal(lua);
}

}  // namespace

void AddBasicFunctions(lua_State* lua)
{
    Take(lua, luaopen_base, {"assert", "error", "ipairs", "select", "tonumber", "type"});
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
    for (char const* name : {"concat", "insert", "remove"}) Wrap(lua, name, WithWalk);
    Wrap(lua, "unpack", Unpack);
    MakeReadOnly(lua);
    lua_setfield(lua, -2, "table");
}

}  // namespace kfshost
