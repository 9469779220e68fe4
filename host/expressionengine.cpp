// A read of an expression, from the stream's text to its value, and what becomes of those that fail.

#include "host/expressionengine_private.h"

#include "frame/errors.h"
#include "frame/services/strings.h"
#include "host/names.h"
#include "keystore/evaluate.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <initializer_list>
#include <limits>
#include <utility>

namespace kfshost {

namespace {

// Of a read inside an expression; what it says stands in the engine.
constexpr int NestedFailure = KFS_Err_LegacyMismatch;
// What a read costs beside the instructions of Lua.
constexpr double StepsOfRead = 50.0;
constexpr char const* NotFinite = "gives a number that isn't finite";

bool HasAnyWord(std::string_view text, std::initializer_list<std::string_view> words)
{
    return std::ranges::any_of(
        words, [text](std::string_view word) { return HasWord(text, word); });
}

// Loops, and long texts, of which there are none without these; names can be written with backslashes.
bool MayTakeLong(std::string_view text)
{
    constexpr std::size_t surelyShort = 4096;
    return text.size() > surelyShort || text.find("..") != text.npos || text.find('\\') != text.npos ||
           HasAnyWord(text, {"for", "while", "repeat", "goto", "function", "rep", "concat", "format"});
}

// Whether what may take long is only that it counts from one small number to another and computes with numbers meanwhile. It has
// about as many instructions as characters, so that it isn't worth slowing them down to count them.
bool EndsSoon(std::string const& text)
{
    constexpr double soon = 1000.0;
    bool const hasOnlyNumbers = text.find_first_of("'\"\\:") == text.npos && text.find("[[") == text.npos &&
                                text.find("[=") == text.npos && text.find("..") == text.npos;
    if (!hasOnlyNumbers || HasAnyWord(text, {"while", "repeat", "goto", "function", "string", "table"})) return false;
    auto steps = static_cast<double>(std::ranges::count_if(text, [](char c) { return c != ' ' && c != '\n'; }));
    for (std::size_t at = text.find("for"); at != text.npos && steps < soon; at = text.find("for", at + 1)) {
        int first = 0;
        int last = 0;
        int end = 0;  // where the scan came to
        char const* const loop = text.c_str() + at;
        if (std::sscanf(loop, "for %*[A-Za-z0-9_] = %5d , %5d do%n", &first, &last, &end) != 2 || end == 0)
            return false;
        steps *= std::max(1, last - first + 1);
    }
    return steps < soon;
}

// The function and its arguments lie on the stack, but for the value, which is made in here: that takes memory, and there may
// be none.
int CallWithVector(lua_State* lua)
{
    auto const& numbers = *static_cast<ExpressionEngine::Numbers const*>(lua_touserdata(lua, 4));
    lua_pop(lua, 1);
    PushNumbers(lua, numbers.data(), numbers.size());
    lua_call(lua, 3, 1);
    return 1;
}

// As ==, which goes through the units one by one.
bool IsSame(u16str const& a, u16str const& b)
{
    return a.size() == b.size() && std::memcmp(a.data(), b.data(), a.size() * sizeof a[0]) == 0;
}

bool IsOfRender()
{
    Q_RenderContext const* const context = Q_RenderContext::PeekCurrent();
    return context && context->GetIsTempCloneContext();
}

std::string SentenceOf(int code)
{
    return code == KFS_Err_NoKeys ? "it has neither keys nor a value" : "error " + std::to_string(code);
}

}  // namespace

// One more expression runs. What can't run for long isn't slowed down by counting.
class ExpressionEngine::ScRun {
public:
    ScRun(ExpressionEngine& engine, Run const& run) : engine_(engine), counted_(engine.lua_->CountsInstructions())
    {
        engine_.runs_[engine_.depth_++] = run;
        engine_.lua_->MeetText(run.compiled->longestText);
        if (run.compiled->isCounted) engine_.lua_->CountInstructions(true);
    }
    ~ScRun()
    {
        engine_.lua_->CountInstructions(counted_);
        --engine_.depth_;
    }
    ScRun(ScRun const&) = delete;
    ScRun& operator=(ScRun const&) = delete;

private:
    ExpressionEngine& engine_;
    bool counted_;
};

ExpressionEngine::ExpressionEngine(KFS_ExpState& state)
    : state_(state),
      lua_(std::make_shared<LuaState>(this)),
      keepsPaths_(IsOfRender())
{}

int ExpressionEngine::UnitsOf(double seconds, KFS_Stream const& seen)
{
    using Limits = std::numeric_limits<int>;
    double const units = std::round(seconds * seen.GetTimeScale());
    return static_cast<int>(
        std::clamp(units, static_cast<double>(Limits::min() + 1), static_cast<double>(Limits::max())));
}

void ExpressionEngine::Evaluate(KFS_Stream const* stream, int time, int flags, double* values, KFS_ParamBag const* bag)
{
    if (depth_ == 0) lua_->BeginRead();
    if (depth_ > 0) CheckPlace(stream, time);
    Run const run{stream, stream->GetKeyData()->stream, time, flags, bag, nullptr};
    bool hasValue = TryEvaluate(run, values);
    if (!hasValue && depth_ == 0 && fault_.isLimit) [[unlikely]] {
        hasValue = lua_->BeginAgain() && TryEvaluate(run, values);
        lua_->Settle();  // the next one needn't be begun again
    }
    if (!hasValue) [[unlikely]]
        Fail(stream, std::move(fault_));
}

bool ExpressionEngine::TryEvaluate(Run const& run, double* values)
{
    CompiledExpression& compiled = CompiledFor(*run.seen);
    if (compiled.fault) [[unlikely]]
        return Failed(*compiled.fault);
    ScRun const running(*this, {run.stream, run.seen, run.time, run.flags, run.bag, &compiled});
    return RunCompiled(values);
}

// By the text, which may have changed while the cache was another context's or another record's at this address. Where memory
// ran out it is tried again: that was then, and not the text's.
CompiledExpression& ExpressionEngine::CompiledFor(KFS_Stream const& seen)
{
    using Held = std::shared_ptr<CompiledExpression>;
    KFS_ExprInfo const& info = seen.GetExprInfo();
    boost::any* const cache = info.GetExpressionCacheImpl();
    if (Held* const held = boost::any_cast<Held>(cache); held && (*held)->lua == lua_ &&
                                                         IsSame((*held)->text, info.GetExpression()) &&
                                                         !((*held)->fault && (*held)->fault->isLimit))
        return **held;
    auto const made = std::make_shared<CompiledExpression>(lua_);
    std::string const text = Q_UTF16ToMBString(info.GetExpression());
    made->text = info.GetExpression();
    made->usesValue = HasWord(text, "value");
    made->usesFrame = HasWord(text, "frame");
    made->mayTakeLong = MayTakeLong(text);
    made->isCounted = made->mayTakeLong && !EndsSoon(text);
    made->function = lua_->Compile(text, made->fault, &made->longestText);
    *cache = made;
    return *made;
}

// ---- one run

bool ExpressionEngine::RunCompiled(double* values)
{
    Run const& run = Current();
    CompiledExpression const& compiled = *run.compiled;
    lua_State* const lua = lua_->Get();
    if (!lua_->Spend(compiled.mayTakeLong ? LuaState::CountInterval : StepsOfRead)) [[unlikely]]
        return Failed({"runs for too long", -1, true});
    std::optional<double> frame;
    if (compiled.usesFrame && !(frame = FrameOf(run)))
        return Failed({"frame: nobody has looked for the rate of the project's keys"});
    if (compiled.usesValue && run.seen->GetDimension() != 1) return RunWithVector(frame, values);
    double key = 0.0;
    if (compiled.usesValue && !ReadOwnKeys(&key)) return false;
    lua_rawgeti(lua, LUA_REGISTRYINDEX, compiled.function);
    PushTimes(lua, frame);
    if (compiled.usesValue)
        lua_pushnumber(lua, key);
    else
        lua_pushnil(lua);
    return TakeResult(lua_pcall(lua, 3, 1, 0), values);
}

bool ExpressionEngine::RunWithVector(std::optional<double> const& frame, double* values)
{
    Run const& run = Current();
    lua_State* const lua = lua_->Get();
    Numbers keys(run.Dimension());
    if (!ReadOwnKeys(keys.data())) return false;
    lua_pushcfunction(lua, CallWithVector);
    lua_rawgeti(lua, LUA_REGISTRYINDEX, run.compiled->function);
    PushTimes(lua, frame);
    lua_pushlightuserdata(lua, &keys);
    return TakeResult(lua_pcall(lua, 4, 1, 0), values);
}

bool ExpressionEngine::Failed(ExpressionFault fault)
{
    fault_ = std::move(fault);
    return false;
}

bool ExpressionEngine::ReadOwnKeys(double* keys)
try {
    Run const& run = Current();
    state_.EvalNoExprValueF(run.stream, run.time, run.flags, keys, nullptr, run.bag);
    return true;
} catch (int code) {
    return Failed({"value: " + SentenceOf(code)});
}

void ExpressionEngine::PushTimes(lua_State* lua, std::optional<double> const& frame)
{
    lua_pushnumber(lua, Current().Seconds());
    if (frame)
        lua_pushnumber(lua, *frame);
    else
        lua_pushnil(lua);
}

// What lua_pcall left on the stack.
bool ExpressionEngine::TakeResult(int status, double* values)
{
    lua_State* const lua = lua_->Get();
    if (status != LUA_OK) [[unlikely]] {
        fault_ = lua_->FaultOf(status);
        fault_.isCircle = innerFault_ && innerFault_->isCircle && innerFault_->text == fault_.text;
        return false;
    }
    if (Current().seen->GetDimension() != 1) return TakeVector(values);
    bool const isNumber = lua_type(lua, -1) == LUA_TNUMBER;
    if (isNumber) *values = lua_tonumber(lua, -1);
    if (isNumber && std::isfinite(*values)) [[likely]] {
        lua_pop(lua, 1);
        return true;
    }
    std::string const what = luaL_typename(lua, -1);
    lua_pop(lua, 1);
    return Failed({isNumber ? NotFinite : "gives a " + what + " in place of a number"});
}

bool ExpressionEngine::TakeVector(double* values)
{
    lua_State* const lua = lua_->Get();
    std::size_t const dimension = Current().Dimension();
    std::string fault;
    if (lua_istable(lua, -1)) {
        std::size_t const count = lua_rawlen(lua, -1);
        if (count != dimension) fault = "gives a table of " + std::to_string(count);
        for (std::size_t i = 0; i < dimension && fault.empty(); ++i) {
            if (lua_rawgeti(lua, -1, static_cast<lua_Integer>(i) + 1) == LUA_TNUMBER)
                values[i] = lua_tonumber(lua, -1);
            else
                fault = std::string("gives a table with a ") + luaL_typename(lua, -1);
            lua_pop(lua, 1);
        }
    } else {
        fault = std::string("gives a ") + luaL_typename(lua, -1);
    }
    lua_pop(lua, 1);
    if (!fault.empty()) return Failed({fault + " in place of a table of " + std::to_string(dimension) + " numbers"});
    if (!std::all_of(values, values + dimension, [](double number) { return std::isfinite(number); }))
        return Failed({NotFinite});
    return true;
}

// A stream that stands in no scene has no keys to go by but its own; its frames are 1/24 s. One rounding: whole frames come out
// as whole numbers.
std::optional<double> ExpressionEngine::FrameOf(Run const& run) const
{
    SceneGroup const* const scene = SceneOf(*run.stream);
    std::optional<Rational> const rate = scene ? scene->frameRate : Rational(24, 1);
    if (!rate) return std::nullopt;
    return static_cast<double>(run.time) * static_cast<double>(rate->Numerator()) /
           (static_cast<double>(run.seen->GetTimeScale()) * static_cast<double>(rate->Denominator()));
}

// ---- what goes wrong

// Fails a read that comes back to itself, or seems to have no end. It isn't recorded here: it is the line that asked which is
// to be told.
void ExpressionEngine::CheckPlace(KFS_Stream const* stream, int time)
{
    constexpr std::size_t shown = 4;
    innerFault_.reset();
    for (std::size_t i = 0; i < depth_ && !innerFault_; ++i)
        if (runs_[i].stream == stream && runs_[i].time == time)
            innerFault_ = ExpressionFault{"reads itself: " + Chain(i, stream), -1, false, true};
    if (!innerFault_ && depth_ == MaxDepth) {
        innerFault_ = ExpressionFault{"reads through more than " + std::to_string(MaxDepth) + " expressions: ... -> " +
                                          Chain(depth_ - shown, stream),
                                      -1, true};
    }
    if (innerFault_) throw int{NestedFailure};
}

std::string ExpressionEngine::Chain(std::size_t from, KFS_Stream const* last) const
{
    std::string chain;
    for (std::size_t i = from; i < depth_; ++i) chain += PathOfStream(*runs_[i].stream) + " -> ";
    return chain + PathOfStream(*last);
}

void ExpressionEngine::Fail(KFS_Stream const* stream, ExpressionFault fault)
{
    bool const isOutermost = depth_ == 0;
    if (isOutermost || !fault.isLimit) Record(stream, fault);
    if (isOutermost) throw static_cast<int>(KFS_Err_ExprNoValue);
    innerFault_ = std::move(fault);
    throw int{NestedFailure};
}

void ExpressionEngine::Record(KFS_Stream const* stream, ExpressionFault const& fault)
{
    if (stream->ExpressionErrorsAreQuiet()) return;
    if (state_.detectingErrors) {
        ++state_.errorCount;
        return;
    }
    if (!failed_.insert(stream).second) return;
    errors_.push_back({stream, PathOfStream(*stream), fault.FullText(), fault.text, fault.line});
}

std::vector<ExpressionError> ExpressionEngine::TakeErrors()
{
    failed_.clear();
    return std::exchange(errors_, {});
}

std::string ExpressionEngine::PathOfStream(KFS_Stream const& stream) const
{
    SceneGroup const* const scene = SceneOf(stream);
    std::string const* const path = scene ? PathsOfScene(*scene).PathOf(&stream) : nullptr;
    return path ? *path : CleanName(Q_UTF16ToMBString(stream.GetDisplayName()));
}

// ---- what expressions ask for

StreamPaths const& ExpressionEngine::PathsOfScene(SceneGroup const& scene) const
{
    auto const known = std::ranges::find(paths_, &scene, [](auto const& pair) { return pair.first; });
    if (known != paths_.end() && (keepsPaths_ || known->second->IsCurrent())) return *known->second;
    auto paths = PathsOf(scene);
    if (!keepsPaths_) paths_.clear();
    return *paths_.emplace_back(&scene, std::move(paths)).second;
}

void ExpressionEngine::ReadStream(lua_State* lua, std::string_view path, double const* seconds, Numbers& values)
{
    lua_->Charge(lua, StepsOfRead);
    SceneGroup const* const scene = SceneOf(*Current().stream);
    StreamPaths::Entry const entry = scene ? PathsOfScene(*scene).Find(path) : StreamPaths::Entry{};
    std::string const quoted = '"' + CleanName(path) + '"';
    if (!entry.stream || SceneOf(*entry.stream) != scene) luaL_error(lua, "there is no stream %s", quoted.c_str());
    Current().stream->GetExprInfo().AddDependency(
        entry.id);  // again each time: a text that is set anew has forgotten it
    KFS_Stream const& seen = *entry.stream->GetKeyData()->stream;
    if (seen.HasExpressionError() && seen.HasEnabledExpression())
        luaL_error(lua, "the expression of %s is in error", quoted.c_str());
    Run const run = Current();
    T_Time const at =
        seconds ? T_Time{UnitsOf(*seconds, seen), seen.GetTimeScale()} : T_Time{run.time, run.seen->GetTimeScale()};
    values.assign(static_cast<std::size_t>(std::max<int>(seen.GetDimension(), 0)), 0.0);
    innerFault_.reset();
    int const code = KFS_GetValueFPlus(entry.stream, &at, run.flags, values.data(), nullptr, run.bag);
    if (innerFault_) {
        std::string const why = innerFault_->text;
        if (innerFault_->isLimit) lua_->Exhaust();
        bool const saysItAll = innerFault_->isLimit || innerFault_->isCircle;
        if (!saysItAll) luaL_error(lua, "stream %s has no value: %s", quoted.c_str(), innerFault_->FullText().c_str());
        luaL_error(lua, "%s", why.c_str());
    }
    if (code != 0) luaL_error(lua, "stream %s has no value: %s", quoted.c_str(), SentenceOf(code).c_str());
}

void ExpressionEngine::ReadKeys(lua_State* lua, int time, double* values)
{
    lua_->Charge(lua, StepsOfRead);
    Run const& run = Current();
    int failed = 0;
    try {
        state_.EvalNoExprValueF(run.stream, time, run.flags, values, nullptr, run.bag);
    } catch (int code) {
        failed = code;
    }
    if (failed != 0) luaL_error(lua, "the stream's keys: %s", SentenceOf(failed).c_str());
}

}  // namespace kfshost
