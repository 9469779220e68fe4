// Values of several components, as tables with arithmetic, and what eases from one value to another.

#include "host/expressionlua_private.h"

#include <cmath>

namespace kfshost {

namespace {

// The address is what vectors' metatable is found by.
constexpr char VectorKey = 0;

// A number, which stands for a vector of as many as are needed, or a table.
class Operand {
public:
    Operand(lua_State* lua, int index) : lua_(lua), index_(index)
    {
        if (lua_istable(lua, index))
            count_ = lua_rawlen(lua, index);
        else
            number_ = CheckNumber(lua, index);
    }

    bool IsTable() const { return lua_istable(lua_, index_); }
    std::size_t Count() const { return count_; }

    // From 1.
    double operator[](std::size_t i) const
    {
        if (!IsTable()) return number_;
        if (lua_rawgeti(lua_, index_, static_cast<lua_Integer>(i)) != LUA_TNUMBER)
            luaL_error(lua_, "component %d of a vector is a %s", static_cast<int>(i), luaL_typename(lua_, -1));
        double const number = lua_tonumber(lua_, -1);
        lua_pop(lua_, 1);
        return number;
    }

private:
    lua_State* lua_;
    int index_;
    std::size_t count_ = 0;
    double number_ = 0.0;
};

// A vector stays on the stack; how its metatable got there doesn't.
void MarkVector(lua_State* lua)
{
    lua_rawgetp(lua, LUA_REGISTRYINDEX, &VectorKey);
    lua_setmetatable(lua, -2);
}

// A number of two numbers; else what is made of each pair of components.
template <class Function>
int Combine(lua_State* lua, Operand const& a, Operand const& b, Function const& function)
{
    if (!a.IsTable() && !b.IsTable()) {
        lua_pushnumber(lua, function(a[1], b[1]));
        return 1;
    }
    std::size_t const count = a.IsTable() ? a.Count() : b.Count();
    if (a.IsTable() && b.IsTable() && a.Count() != b.Count()) {
        return luaL_error(lua, "vectors of %d and %d components", static_cast<int>(a.Count()),
                          static_cast<int>(b.Count()));
    }
    LuaState::Of(lua).Charge(lua, static_cast<double>(count));
    lua_createtable(lua, static_cast<int>(count), 0);
    for (std::size_t i = 1; i <= count; ++i) {
        lua_pushnumber(lua, function(a[i], b[i]));
        lua_rawseti(lua, -2, static_cast<lua_Integer>(i));
    }
    MarkVector(lua);
    return 1;
}

template <class Function>
int CombineFirstTwo(lua_State* lua, Function const& function)
{
    return Combine(lua, Operand(lua, 1), Operand(lua, 2), function);
}

int Plus(lua_State* lua)
{
    return CombineFirstTwo(
        lua, [](double a, double b) { return a + b; });
}

int Minus(lua_State* lua)
{
    return CombineFirstTwo(
        lua, [](double a, double b) { return a - b; });
}

int Times(lua_State* lua)
{
    return CombineFirstTwo(
        lua, [](double a, double b) { return a * b; });
}

int Over(lua_State* lua)
{
    return CombineFirstTwo(
        lua, [](double a, double b) { return a / b; });
}

int Negative(lua_State* lua)
{
    Operand const a(lua, 1);
    return Combine(lua, a, a, [](double x, double) { return -x; });
}

// v.x to v.w.
int Component(lua_State* lua)
{
    constexpr std::string_view names = "xyzw";
    std::size_t length = 0;
    char const* const name = lua_type(lua, 2) == LUA_TSTRING ? lua_tolstring(lua, 2, &length) : "";
    std::size_t const place = length == 1 ? names.find(*name) : std::string_view::npos;
    if (place == std::string_view::npos)
        lua_pushnil(lua);
    else
        lua_rawgeti(lua, 1, static_cast<lua_Integer>(place + 1));
    return 1;
}

int Vector(lua_State* lua)
{
    int const count = lua_gettop(lua);
    ChargeNumbers(lua, 1);
    lua_createtable(lua, count, 0);
    for (int i = 1; i <= count; ++i) {
        lua_pushnumber(lua, luaL_checknumber(lua, i));
        lua_rawseti(lua, -2, i);
    }
    MarkVector(lua);
    return 1;
}

// The sum of the products of two vectors' components.
double Product(lua_State* lua, Operand const& a, Operand const& b)
{
    if (!a.IsTable() || !b.IsTable() || a.Count() != b.Count()) luaL_error(lua, "takes two vectors of one dimension");
    LuaState::Of(lua).Charge(lua, static_cast<double>(a.Count()));
    double sum = 0.0;
    for (std::size_t i = 1; i <= a.Count(); ++i) sum += a[i] * b[i];
    return sum;
}

int Dot(lua_State* lua)
{
    lua_pushnumber(lua, Product(lua, Operand(lua, 1), Operand(lua, 2)));
    return 1;
}

double LengthOfFirst(lua_State* lua)
{
    Operand const a(lua, 1);
    return a.IsTable() ? std::sqrt(Product(lua, a, a)) : std::abs(a[1]);
}

int Length(lua_State* lua)
{
    lua_pushnumber(lua, LengthOfFirst(lua));
    return 1;
}

// What has no direction stays as it is.
int Normalize(lua_State* lua)
{
    double const length = LengthOfFirst(lua);
    Operand const a(lua, 1);
    return Combine(lua, a, a, [length](double x, double) { return length > 0.0 ? x / length : x; });
}

// Both ends are met to the bit.
double Between(double a, double b, double t)
{
    return t == 1.0 ? b : a + (b - a) * t;
}

int Lerp(lua_State* lua)
{
    double const t = CheckNumber(lua, 3);
    return CombineFirstTwo(lua, [t](double a, double b) { return Between(a, b, t); });
}

// How far the first argument is on the way from the second to the third, held at both.
double WayOfFirst(lua_State* lua)
{
    double const x = CheckNumber(lua, 1);
    double const from = CheckNumber(lua, 2);
    double const to = CheckNumber(lua, 3);
    if (from == to) return x < from ? 0.0 : 1.0;
    double const way = (x - from) / (to - from);
    return way < 0.0 ? 0.0 : way > 1.0 ? 1.0 : way;
}

int Linear(lua_State* lua)
{
    double const t = WayOfFirst(lua);
    return Combine(lua, Operand(lua, 4), Operand(lua, 5), [t](double a, double b) { return Between(a, b, t); });
}

int Ease(lua_State* lua)
{
    double const way = WayOfFirst(lua);
    double const t = way * way * (3.0 - 2.0 * way);
    return Combine(lua, Operand(lua, 4), Operand(lua, 5), [t](double a, double b) { return Between(a, b, t); });
}

}  // namespace

void PushNumbers(lua_State* lua, double const* numbers, std::size_t count)
{
    if (count == 1) {
        lua_pushnumber(lua, *numbers);
        return;
    }
    lua_createtable(lua, static_cast<int>(count), 0);
    for (std::size_t i = 0; i < count; ++i) {
        lua_pushnumber(lua, numbers[i]);
        lua_rawseti(lua, -2, static_cast<lua_Integer>(i) + 1);
    }
    MarkVector(lua);
}

void AddVectorFunctions(lua_State* lua)
{
    constexpr luaL_Reg arithmetic[] = {{"__add", Plus},     {"__sub", Minus},       {"__mul", Times},  {"__div", Over},
                                       {"__unm", Negative}, {"__index", Component}, {nullptr, nullptr}};
    lua_newtable(lua);
    luaL_setfuncs(lua, arithmetic, 0);
    lua_rawsetp(lua, LUA_REGISTRYINDEX, &VectorKey);
    constexpr luaL_Reg functions[] = {{"vec", Vector}, {"dot", Dot},       {"length", Length}, {"normalize", Normalize},
                                      {"lerp", Lerp},  {"linear", Linear}, {"ease", Ease},     {nullptr, nullptr}};
    luaL_setfuncs(lua, functions, 0);
}

}  // namespace kfshost
