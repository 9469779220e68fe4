#pragma once

#include "host/rational.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

// The build of the library whose errors are C++ exceptions: an error unwinds the frames that it leaves, destructors included,
// where the other build would jump over them. It has C++ names, so its headers stand here as they are.
#include <lauxlib.h>
#include <lua.h>
#include <lualib.h>

namespace kfshost {

class ExpressionEngine;

// Why an expression has no value.
struct ExpressionFault {
    std::string text;  // without the line
    int line = -1;
    // The read as a whole went too far; this expression needn't be the one at fault.
    bool isLimit = false;
    bool isCircle = false;  // its text tells the way round

    std::string FullText() const;
};

// A Lua for expressions: its functions are those of the sandbox, and what a read may use of it is limited. Threads: one at a
// time.
class LuaState {
public:
    // `engine` may be null, where nothing runs. Throws std::bad_alloc.
    explicit LuaState(ExpressionEngine* engine);
    ~LuaState();
    LuaState(LuaState const&) = delete;
    LuaState& operator=(LuaState const&) = delete;

    static LuaState& Of(lua_State* lua) { return **static_cast<LuaState**>(lua_getextraspace(lua)); }
    lua_State* Get() const { return lua_; }
    ExpressionEngine* Engine() const { return engine_; }

    // A read begins, with all that it may use. What it calls for is part of it.
    void BeginRead()
    {
        if (used_ > base_ + MostGarbage) [[unlikely]]
            Settle();
        isSettled_ = used_ == base_;
        spent_ = {};
    }
    // Begins a read again which failed at a limit that it may only have met because of what other reads left in memory, so that
    // what comes out of a read doesn't depend on them. False where there is nothing to be won. Only outside a call.
    bool BeginAgain();
    // Drops all garbage: what is left is what stays. Only outside a call.
    void Settle();
    // Counts work that no instruction of Lua stands for; raises the limit's error. Only inside a call.
    void Charge(lua_State* lua, double steps);
    // The same outside a call; whether the read may go on.
    bool Spend(double steps)
    {
        spent_.steps += steps;
        if (!(spent_.steps <= MaxSteps)) spent_.isExhausted = true;
        return !spent_.isExhausted;
    }
    // The read has gone beyond another limit.
    void Exhaust() { spent_.isExhausted = true; }
    // What runs from here on can come by a text of so many bytes.
    void MeetText(std::size_t bytes) { spent_.longestText = bytes > spent_.longestText ? bytes : spent_.longestText; }
    // Counts the instructions from here on.
    void CountInstructions(bool on)
    {
        if (on != countsInstructions_) SwitchCounting(on);
    }
    bool CountsInstructions() const { return countsInstructions_; }

    // A function that takes time, frame and value; LUA_NOREF with a fault. Release gives it back. It may use as much as a
    // read, and is no part of the one that runs. Into `longestText` go the bytes of the longest text that stands in it.
    int Compile(std::string_view text, std::optional<ExpressionFault>& fault, std::size_t* longestText = nullptr);
    void Release(int function);

    // The fault for a status that lua_pcall answered, whose error object is on top of the stack.
    ExpressionFault FaultOf(int status);
    ExpressionFault FaultOfMemory();

    // At most this much held beyond what stays from read to read, and this much in all of a read, garbage included.
    static constexpr std::size_t MaxMemory = std::size_t{2} << 20;
    static constexpr std::size_t MaxAllocated = std::size_t{64} << 20;
    // Instructions and what counts like them.
    static constexpr double MaxSteps = 1e7;
    static constexpr int CountInterval = 200;
    static constexpr std::size_t MaxText = std::size_t{64} << 10;

private:
    static void* Allocate(void* owner, void* block, std::size_t oldSize, std::size_t newSize);
    static void Count(lua_State* lua, lua_Debug* record);
    void SwitchCounting(bool on);
    // The more memory is held, and the longer a text is, the longer a single instruction may take, such as a for up to a text or
    // an order of two.
    double StepsOfInterval();

    // Beyond it a read begins with a collection. Lua's own keeps most reads below it.
    static constexpr std::size_t MostGarbage = std::size_t{64} << 10;

    // By the read that runs.
    struct Spent {
        std::size_t allocated = 0;
        std::size_t longestText = 0;
        double steps = 0.0;
        bool isExhausted = false;
        bool hasMetMemory = false;  // what it may still do went by the memory in use
    };

    lua_State* lua_ = nullptr;
    ExpressionEngine* engine_;
    std::size_t used_ = 0;
    // Of it what stays from read to read, or less, where functions have come or gone since it was measured. A read that begins
    // in the dark about it is only kept shorter.
    std::size_t base_ = 0;
    std::size_t sandbox_ = 0;  // with no function compiled
    bool isSettled_ = false;   // the read began with what stays, and nothing else
    Spent spent_;
    bool countsInstructions_ = false;
};

// Whether a word stands in a text of Lua, in a comment or a string too.
bool HasWord(std::string_view text, std::string_view word);

// ---- what the sandbox is made of; each adds to the table on top of the stack

void AddBasicFunctions(lua_State* lua);
void AddMathFunctions(lua_State* lua);
void AddStringFunctions(lua_State* lua);
void AddTableFunctions(lua_State* lua);
void AddVectorFunctions(lua_State* lua);
void AddStreamFunctions(lua_State* lua);

// Makes the table on top of the stack one that can be read but not written, as which it stays there.
void MakeReadOnly(lua_State* lua);
// Arguments that are numbers. A text may stand for one, and then it is counted how long that takes to read.
double CheckNumber(lua_State* lua, int index);
double OptNumber(lua_State* lua, int index, double otherwise);
// For all from `first` on, which the caller goes on to read; a step each.
void ChargeNumbers(lua_State* lua, int first);
// A number, or a vector of several.
void PushNumbers(lua_State* lua, double const* numbers, std::size_t count);

}  // namespace kfshost
