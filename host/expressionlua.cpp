// A Lua in which expressions can do nothing but compute, and that no expression can make run for ever or eat all memory.

#include "host/expressionlua_private.h"

#include <algorithm>
#include <charconv>
#include <cstdlib>
#include <new>
#include <utility>

namespace kfshost {

namespace {

constexpr std::string_view ChunkName = "=expression";
constexpr std::string_view Place = "expression:";
constexpr std::size_t MostShown = 1000;  // of an error's text
constexpr std::size_t ShortText = 64;    // with Lua's head of it; all work on it is an instruction's

bool IsNameChar(char c)
{
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_';
}

// Runs work that may raise errors; answers the status, with the error object on the stack where it isn't LUA_OK.
template <class Work>
int Protected(lua_State* lua, Work const& work)
{
    lua_pushcfunction(lua, [](lua_State* inside) {
        (*static_cast<Work const*>(lua_touserdata(inside, 1)))(inside);
        return 0;
    });
    lua_pushlightuserdata(lua, const_cast<Work*>(&work));
    return lua_pcall(lua, 1, 0, 0);
}

// All that expressions can name. The libraries' own tables stay out of reach, and so does everything that opens a way to
// them, keeps something from one read to the next, or answers differently from one run to the next.
void MakeSandbox(lua_State* lua)
{
    lua_newtable(lua);
    AddMathFunctions(lua);
    AddBasicFunctions(lua);  // after it: a type is what Lua calls so, not the kind of a number
    AddStringFunctions(lua);
    AddTableFunctions(lua);
    AddVectorFunctions(lua);
    AddStreamFunctions(lua);
    MakeReadOnly(lua);
    lua_rawseti(lua, LUA_REGISTRYINDEX, LUA_RIDX_GLOBALS);
    lua_pushnil(lua);
    lua_setfield(lua, LUA_REGISTRYINDEX, LUA_LOADED_TABLE);
}

int Refuse(lua_State* lua)
{
    return luaL_error(lua, "only local variables can be set");
}

// The text behind a prefix on its first line.
int Load(lua_State* lua, std::string_view prefix, std::string_view text)
{
    std::string const chunk = std::string(prefix) + std::string(text);
    return luaL_loadbufferx(lua, chunk.data(), chunk.size(), ChunkName.data(), "t");
}

// An expression, or else statements. What is wrong with a text that is neither is said of what it looks like.
int LoadEither(lua_State* lua, std::string_view text)
{
    int const asExpression = Load(lua, "local time,frame,value=...return ", text);
    if (asExpression == LUA_OK) return LUA_OK;
    int const asStatements = Load(lua, "local time,frame,value=...;", text);
    bool const looksLikeExpression = asStatements != LUA_OK && !HasWord(text, "return");
    if (looksLikeExpression)
        lua_pop(lua, 1);
    else
        lua_remove(lua, -2);
    return looksLikeExpression ? asExpression : asStatements;
}

// As much of an error's text as is shown, in whole characters.
std::string BeginOf(std::string_view text)
{
    std::size_t length = std::min(text.size(), MostShown);
    auto const isInside = [&](std::size_t at) { return (static_cast<unsigned char>(text[at]) & 0xC0) == 0x80; };
    if (length < text.size())
        while (length > 0 && isInside(length)) --length;
    return std::string(text.substr(0, length));
}

// Of a text that begins with a place, as Lua puts it there; what only looks alike stays.
void TakeLine(ExpressionFault& fault)
{
    if (!fault.text.starts_with(Place)) return;
    char const* const begin = fault.text.data() + Place.size();
    char const* const end = fault.text.data() + fault.text.size();
    int line = 0;
    auto const [behind, code] = std::from_chars(begin, end, line);
    if (code != std::errc() || line < 0 || !std::string_view(behind, end).starts_with(": ")) return;
    if (line > 0) fault.line = line;
    fault.text.erase(0, static_cast<std::size_t>(behind + 2 - fault.text.data()));
}

}  // namespace

std::string ExpressionFault::FullText() const
{
    return line > 0 ? "line " + std::to_string(line) + ": " + text : text;
}

bool HasWord(std::string_view text, std::string_view word)
{
    for (std::size_t at = text.find(word); at != std::string_view::npos; at = text.find(word, at + 1)) {
        std::size_t const end = at + word.size();
        if ((at == 0 || !IsNameChar(text[at - 1])) && (end == text.size() || !IsNameChar(text[end]))) return true;
    }
    return false;
}

void MakeReadOnly(lua_State* lua)
{
    lua_newtable(lua);           // the face
    lua_createtable(lua, 0, 2);  // its metatable
    lua_rotate(lua, -3, -1);     // content on top
    lua_setfield(lua, -2, "__index");
    lua_pushcfunction(lua, Refuse);
    lua_setfield(lua, -2, "__newindex");
    lua_setmetatable(lua, -2);
}

LuaState::LuaState(ExpressionEngine* engine) : engine_(engine)
{
    lua_ = lua_newstate(Allocate, this);
    if (!lua_) throw std::bad_alloc();
    *static_cast<LuaState**>(lua_getextraspace(lua_)) = this;
    if (Protected(lua_, [](lua_State* inside) { MakeSandbox(inside); }) != LUA_OK) {
        lua_close(lua_);
        throw std::bad_alloc();
    }
    Settle();
    sandbox_ = base_;
}

LuaState::~LuaState()
{
    lua_close(lua_);
}

void* LuaState::Allocate(void* owner, void* block, std::size_t oldSize, std::size_t newSize)
{
    LuaState& state = *static_cast<LuaState*>(owner);
    bool const isText = !block && oldSize == LUA_TSTRING;
    if (!block) oldSize = 0;  // it is the kind of what is to be made
    if (newSize == 0) {
        std::free(block);
        state.used_ -= oldSize;
        return nullptr;
    }
    if (newSize > oldSize) {
        std::size_t const more = newSize - oldSize;
        if (more > MaxMemory || state.used_ + more > state.base_ + MaxMemory ||
            state.spent_.allocated + newSize > MaxAllocated) {
            state.spent_.hasMetMemory = true;
            return nullptr;
        }
        state.spent_.allocated += newSize;
        if (isText && newSize > ShortText) state.MeetText(newSize);
    }
    void* const grown = std::realloc(block, newSize);
    if (grown) state.used_ += newSize - oldSize;
    return grown;
}

double LuaState::StepsOfInterval()
{
    constexpr std::size_t freeHeld = 1 << 14;  // the garbage of what has just been compiled is less
    constexpr double heldForStep = 1 << 12;
    constexpr double textForStep = 1 << 4;
    double steps = 1.0 + static_cast<double>(spent_.longestText) / textForStep;
    if (used_ > base_ + freeHeld) {
        spent_.hasMetMemory = true;
        steps += static_cast<double>(used_ - base_ - freeHeld) / heldForStep;
    }
    return CountInterval * steps;
}

void LuaState::Settle()
{
    lua_gc(lua_, LUA_GCCOLLECT);
    base_ = used_;
}

bool LuaState::BeginAgain()
{
    if (isSettled_ || !spent_.hasMetMemory) return false;
    Settle();
    BeginRead();
    return true;
}

namespace {

constexpr char const* TooLong = "runs for too long";

}  // namespace

void LuaState::Charge(lua_State* lua, double steps)
{
    if (!Spend(steps)) luaL_error(lua, TooLong);
}

void LuaState::Count(lua_State* lua, lua_Debug* record)
{
    LuaState& state = Of(lua);
    if (state.Spend(state.StepsOfInterval())) return;
    lua_getinfo(lua, "l", record);
    lua_pushfstring(lua, "%s%d: %s", Place.data(), record->currentline, TooLong);
    lua_error(lua);
}

void LuaState::SwitchCounting(bool on)
{
    lua_sethook(lua_, on ? Count : nullptr, on ? LUA_MASKCOUNT : 0, on ? CountInterval : 0);
    countsInstructions_ = on;
}

int LuaState::Compile(std::string_view text, std::optional<ExpressionFault>& fault, std::size_t* longestText)
{
    int function = LUA_NOREF;
    if (text.size() > MaxText) {
        fault = ExpressionFault{"is longer than " + std::to_string(MaxText) + " bytes"};
        return function;
    }
    if (HasWord(text, "_ENV")) {  // what is assigned to it would stay from one read to the next
        fault = ExpressionFault{"_ENV can't be used"};
        return function;
    }
    int status = LUA_OK;
    auto const load = [&](lua_State* inside) {
        status = LoadEither(inside, text);
        if (status == LUA_OK)
            function = luaL_ref(inside, LUA_REGISTRYINDEX);
        else
            lua_error(inside);
    };
    Spent const outer = std::exchange(spent_, {});
    std::size_t const base = std::exchange(base_, used_);
    if (lua_checkstack(lua_, LUA_MINSTACK) == 0)
        fault = FaultOfMemory();
    else if (int const outcome = Protected(lua_, load); outcome != LUA_OK)
        fault = FaultOf(status == LUA_OK ? outcome : status);
    if (longestText) *longestText = spent_.longestText;
    spent_ = outer;
    base_ = base;
    isSettled_ = false;
    return function;
}

void LuaState::Release(int function)
{
    luaL_unref(lua_, LUA_REGISTRYINDEX, function);  // into a free place of the registry: nothing is allocated
    base_ = sandbox_;
    isSettled_ = false;
}

ExpressionFault LuaState::FaultOfMemory()
{
    spent_.isExhausted = true;
    return {"needs too much memory", -1, true};
}

ExpressionFault LuaState::FaultOf(int status)
{
    ExpressionFault fault;
    // Below 0 something else than an error of Lua was thrown: by what reads call it can only be want of memory. What it was isn't
    // known any more.
    if (status == LUA_ERRMEM || status < 0) {
        fault = FaultOfMemory();
    } else if (lua_type(lua_, -1) == LUA_TSTRING) {
        std::size_t length = 0;
        char const* const text = lua_tolstring(lua_, -1, &length);
        fault.text = BeginOf({text, length});
        TakeLine(fault);
    } else {
        fault.text = std::string("error with a ") + luaL_typename(lua_, -1) + " in place of a text";
    }
    fault.isLimit = spent_.isExhausted;
    lua_pop(lua_, 1);
    return fault;
}

}  // namespace kfshost
