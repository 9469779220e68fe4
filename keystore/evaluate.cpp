// A read from the call down to the cache record, and what hosts call at its end.

#include "keystore/evaluate.h"

#include "frame/boundary_private.h"
#include "frame/project.h"
#include "frame/report_private.h"
#include "frame/services/memory.h"
#include "frame/timehelpers.h"
#include "keystore/batchreads.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/expstate.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/renderstates_private.h"
#include "keystore/savedrecords_private.h"
#include "keystore/shortcuts_private.h"
#include "keystore/shortread_private.h"
#include "keystore/valuedata_private.h"
#include "overrides/parambag.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <new>
#include <utility>

namespace {

// What the two forms of a read do differently.
struct ExternalForm {
    using Value = void;
    static void EvalExpr(KFS_ExpState* state, KFS_Stream const* stream, int time, int flags, void* value,
                         KFS_ParamBag const* bag)
    {
        state->EvalExprValue(stream, time, flags, value, bag);
    }
    // Where the expression read another stream of another data type, its value becomes this stream's by way of doubles.
    static int Adapt(KFS_Stream const* stream, KFS_Stream const* target, void* value);
};

struct DoubleForm {
    using Value = double;
    static void EvalExpr(KFS_ExpState* state, KFS_Stream const* stream, int time, int flags, double* value,
                         KFS_ParamBag const* bag)
    {
        state->EvalExprValueF(stream, time, flags, value, bag);
    }
    static int Adapt(KFS_Stream const*, KFS_Stream const*, double*) { return 0; }
};

constexpr int MaxAdaptedDimension = 4;

short ValueItemKind(KFS_Stream const* stream)
{
    return stream->HasNoKeys() ? KFS_Item_CacheValue : KFS_Item_KeyValue;
}

// `stream` as this thread sees it.
int ExternalForm::Adapt(KFS_Stream const* stream, KFS_Stream const* target, void* value)
{
    if (target->GetValueDesc()->dataType == stream->GetValueDesc()->dataType ||
        target->GetDimension() != stream->GetDimension() || stream->GetDimension() > MaxAdaptedDimension)
        return 0;
    double numbers[MaxAdaptedDimension] = {};
    if (int const code = KFSp_ConvertItemToFloat(target, 0, ValueItemKind(target), value, numbers)) return code;
    return KFSp_ConvertItemFromFloat(stream, 0, ValueItemKind(stream), numbers, value);
}

// A stream, and what this thread sees of it: its place and its virtual operations are the stream's, all else is seen.
struct Reading {
    KFS_Stream const* stream;
    KFS_Stream const* seen;
    int time;  // in the stream's scale, as the others are as the caller gave them
    int flags;
    KFS_ParamBag const* bag;
};

// What stands in a follower's place may be a group, or a leaf that has no room for its value there.
bool IsFollower(KFS_Stream const* leaf)
{
    return leaf && leaf->GetDimension() == 1;
}

// The buffer is taken as doubles, whatever the data type. A dimension without a follower keeps what is there.
int ReadFollowers(Reading const& reading, double* value)
{
    T_Time const at{reading.time, reading.seen->GetTimeScale()};
    for (int d = 0; d < reading.seen->GetDimension(); ++d) {
        KFS_Stream const* const follower = reading.stream->GetSeparationFollower(d);
        if (!IsFollower(follower)) continue;
        int const code = KFS_GetValueFPlus(follower, &at, reading.flags, value + d, nullptr, reading.bag);
        if (code != 0) return code;
    }
    return 0;
}

bool WantsExpression(Reading const& reading, void const* value)
{
    return (reading.flags & KFS_EvalFlag_NoExpression) == 0 && value && reading.seen->HasExpression() &&
           !reading.seen->GetExprInfo().GetFlag(KFS_ExprFlag_Disabled);
}

// Whether the expression answered; `code` is the read's result then.
template <class Form>
bool ReadExpression(KFS_ExpState* state, Reading const& reading, typename Form::Value* value, unsigned char* atKey,
                    int* code)
{
    KFS_Stream const* target = reading.stream;
    int targetTime = reading.time;
    KFS_ParamBag resolved;
    state->ResolveExprTarget(&target, &targetTime, reading.bag, &resolved);
    KFS_ParamBag const* const inForce = resolved.GetOverrideCount() == 0 ? reading.bag : &resolved;
    boost::shared_ptr<KFS_ExprContext> const context = state->GetExprContext(target);
    if (!context || !context->CanEvaluate()) return false;
    *code = KFSp_Boundary([&] { Form::EvalExpr(state, target, targetTime, reading.flags, value, inForce); });
    if (*code != 0 && *code != KFS_Err_ExprNoValue) return true;
    if (atKey) *atKey = 0;
    if (*code == KFS_Err_ExprNoValue) return false;
    if (target != reading.stream) *code = Form::Adapt(reading.seen, KFSp_Seen(target), value);
    return true;
}

// A render context that holds no KFS_ExpState can't say how to read.
int ReportMissingState()
{
    return Qp_ReportLegacyErrString(KFSp_ReportId(KFSp_Op_GetValue), KFSp_Severity, KFS_Err_LegacyMismatch, nullptr);
}

// What the external form goes by where the thread has no render context.
Q_RenderContext const* ProjectRenderContext(KFS_Stream const* stream)
{
    KFS_Project const* const project = KFS_GetConstProject(stream, true);
    return project ? project->GetRenderContext(true) : nullptr;
}

// The double form doesn't know of projects: a thread without a current render context is a mistake, which the service
// reports.
[[gnu::cold]] void ReportMissingContext()
{
    static_cast<void>(Q_RenderContext::GetCurrent(false));
}

// The expression and, where it has no value, the keys. An expression may have the host replace the state that runs it,
// so a reference is held, unless the state has promised to stay; a read of the keys alone does without.
template <class Form, class ReadKeys>
[[gnu::noinline]] int ReadWithExpression(Q_RenderContext const* context, KFS_ExpState* state, Reading const& reading,
                                         typename Form::Value* value, unsigned char* atKey, ReadKeys const& readKeys)
{
    boost::shared_ptr<Q_RenderState> held;
    if (!state->StaysInPlace()) held = context->GetState(KFS_ExpState::S_StateName);
    int code = 0;
    if (!ReadExpression<Form>(state, reading, value, atKey, &code)) readKeys(state);
    return code == KFS_Err_ExprNoValue ? 0 : code;
}

// The stages that both forms share, up to the keys; `readKeys` takes the state that says how to read them.
template <class Form, class ReadKeys>
int ReadStaged(Reading const& reading, Q_RenderContext const* context, typename Form::Value* value,
               unsigned char* atKey, ReadKeys const& readKeys)
{
    if (value && KFSp_AnswersFromFollowers(reading.stream)) [[unlikely]]
        return ReadFollowers(reading, static_cast<double*>(value));
    KFS_ExpState* const state = context ? KFSp_GetRenderStates(context).expState : nullptr;
    if (!state) [[unlikely]]
        return ReportMissingState();
    if (WantsExpression(reading, value)) [[unlikely]]
        return ReadWithExpression<Form>(context, state, reading, value, atKey, readKeys);
    readKeys(state);
    return 0;
}

// What both ends of a read do before the value is copied out: refuse, and bring the cache to the time. Whether there is
// a value to copy.
bool BringCache(KFS_StreamKeyData const* data, int time, KFSp_CacheRequest request)
{
    KFS_Stream const* const seen = data->stream;
    if (KFSp_HasNoValue(seen, data)) [[unlikely]]
        throw KFSp_ReportErr(KFSp_Op_GetValueNoExpr, KFS_Err_NoKeys, KFSp_Row_GetValue);
    if (request.wantsValue && !request.keyOnly && !request.atKey && !request.interpFunc) [[likely]] {
        KFSp_UpdateCacheToTime(seen, data, time);
        return seen->GetDimension() >= 1;
    }
    unsigned char found = 0;
    unsigned char* const atKey = std::exchange(request.atKey, &found);
    KFSp_UpdateCacheToTime(seen, data, time, request);
    if (atKey) *atKey = found;
    return request.wantsValue && seen->GetDimension() >= 1 && (!request.keyOnly || found);
}

// KFS_AddTime in the time's own scale; its common case is one addition.
int Step(T_Time const* step, T_Time* time)
{
    int next = 0;
    if (step->scale != time->scale || time->scale == 0 || __builtin_add_overflow(time->value, step->value, &next))
        return KFS_AddTime(step, time, 0, time);
    time->value = next;
    return 0;
}

// A few steps along the time line at a time, so that they are read together.
int ReadSteps(KFS_Stream const* stream, T_Time time, T_Time const* step, int count, int flags, int dimension,
              double* values)
{
    std::array<T_Time, 64> times;
    for (int done = 0; done < count;) {
        int number = 0;
        int steps = 0;  // the code of the step after the last time
        while (number < static_cast<int>(times.size()) && done + number < count && steps == 0) {
            times[static_cast<std::size_t>(number++)] = time;
            if (done + number < count) steps = Step(step, &time);
        }
        double* const to = values + static_cast<std::ptrdiff_t>(done) * dimension;
        if (int const code = KFS_ReadTimes(stream, times.data(), number, flags, to, nullptr)) return code;
        if (steps != 0) return steps;
        done += number;
    }
    return 0;
}

int ReadSamples(KFS_Stream const* stream, T_Time time, T_Time const* step, int count, int flags, double* values)
{
    int const dimension = KFSp_Seen(stream)->GetDimension();
    if (!stream->GetParent() || !stream->AreDimensionsSeparated())
        return ReadSteps(stream, time, step, count, flags, dimension, values);
    std::vector<KFS_Stream const*> followers;
    stream->GetSeparationFollowers(followers);
    for (int sample = 0; sample < count; ++sample, values += dimension) {
        KFSp_FirstError error;
        for (int d = 0; d < dimension && error.None(); ++d) {
            values[d] = 0.0;
            auto const place = static_cast<std::size_t>(d);
            if (place < followers.size() && IsFollower(followers[place]))
                error.Keep(KFS_GetValueFPlus(followers[place], &time, flags, values + d, nullptr, nullptr));
        }
        if (error.None() && sample + 1 < count) error.Keep(KFS_AddTime(step, &time, 0, &time));
        if (!error.None()) return error.Code();
    }
    return 0;
}

}  // namespace

int KFS_GetValue(KFS_Stream const* stream, T_Time const* time, unsigned char, void* value, unsigned char* atKey,
                 KFS_ParamBag const* bag)
{
    return KFS_GetValuePlus(stream, time, 0, value, atKey, bag, nullptr, 0);
}

namespace {

int CopyExternalOut(KFS_Stream const* seen, void const* from, void* value)
{
    KFS_CopyItemFunc const copy = KFSp_OutwardFunc(seen);
    return copy(KFSp_HandedTo(copy, seen), seen->GetItemRefcon(), KFS_Item_CacheValue, from, value);
}

// The read stage by stage.
[[gnu::noinline]] int ReadExternalStaged(KFS_Stream const* stream, T_Time const* time, int flags, void* value,
                                         unsigned char* atKey, KFS_ParamBag const* bag, KFS_InterpFunc* interpFunc,
                                         long refcon)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_GetValue, stream, KFSp_Row_GetValue)) return code;
    return KFSp_Boundary([&] {
        Q_RenderContext const* const current = KFSp_PeekRenderContext();
        KFS_Stream const* const seen = KFSp_Seen(stream, current);
        int at = 0;
        if (int const code = KFSp_TimeInStream(seen, time, &at)) return code;
        return ReadStaged<ExternalForm>(
            {stream, seen, at, flags, bag}, current ? current : ProjectRenderContext(stream), value, atKey,
            [&](KFS_ExpState* state) {
                state->EvalNoExprValue(stream, at, flags, value, atKey, bag, interpFunc, refcon);
            });
    });
}

[[gnu::noinline]] int ReadDoublesStaged(KFS_Stream const* stream, T_Time const* time, int flags, double* value,
                                        unsigned char* atKey, KFS_ParamBag const* bag)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_GetValue, stream, KFSp_Row_GetValue)) return code;
    return KFSp_Boundary([&] {
        Q_RenderContext const* const current = KFSp_PeekRenderContext();
        KFS_Stream const* const seen = KFSp_Seen(stream, current);
        int at = 0;
        if (int const code = KFSp_TimeInStream(seen, time, &at)) return code;
        if (seen->IsCustom()) [[unlikely]]
            return KFSp_RefuseCustomValue(KFSp_Op_GetFloat, KFSp_Row_ComputeFloatValues);
        if (!current) [[unlikely]]
            ReportMissingContext();
        return ReadStaged<DoubleForm>({stream, seen, at, flags, bag}, current, value, atKey, [&](KFS_ExpState* state) {
            state->EvalNoExprValueF(stream, at, flags, value, atKey, bag);
        });
    });
}

// The end of a short read, apart as KFSp_EndDoubles is.
[[gnu::noinline]] int EndExternal(KFS_Stream const* seen, void const* from, void* value)
{
    return KFSp_Boundary([&] { return CopyExternalOut(seen, from, value); });
}

}  // namespace

[[gnu::noinline]] int KFSp_EndDoubles(KFS_Stream const* stream, KFS_Stream const* seen, void const* from, double* value)
{
    return KFSp_Boundary([&] { return KFSp_CopyDoublesOut(stream, seen, from, value); });
}

bool KFSp_MayAnswerFromFollowers(KFS_Stream const* stream) noexcept
{
    try {
        return KFSp_AnswersFromFollowers(stream);
    } catch (...) {
        return true;
    }
}

int KFS_GetValuePlus(KFS_Stream const* stream, T_Time const* time, int flags, void* value, unsigned char* atKey,
                     KFS_ParamBag const* bag, KFS_InterpFunc* interpFunc, long refcon)
{
    KFSp_ShortRead read;
    if (!time || !value || atKey || bag || interpFunc)
        return ReadExternalStaged(stream, time, flags, value, atKey, bag, interpFunc, refcon);
    int code = 0;
    if (!KFSp_IsShortRead(stream, KFSp_PeekRenderContext(), time, flags, &read) || !KFSp_BringShort(read, &code))
        return ReadExternalStaged(stream, time, flags, value, nullptr, nullptr, nullptr, refcon);
    if (code != 0) return code;
    return EndExternal(read.seen, KFSp_ValueData(read.data->cache), value);
}

int KFS_GetValueF(KFS_Stream const* stream, T_Time const* time, unsigned char, double* value, unsigned char* atKey,
                  KFS_ParamBag const* bag)
{
    return KFS_GetValueFPlus(stream, time, 0, value, atKey, bag);
}

int KFS_GetValueFPlus(KFS_Stream const* stream, T_Time const* time, int flags, double* value, unsigned char* atKey,
                      KFS_ParamBag const* bag)
{
    KFSp_ShortRead read;
    if (!time || !value || atKey || bag) [[unlikely]]
        return ReadDoublesStaged(stream, time, flags, value, atKey, bag);
    int code = 0;
    if (!KFSp_IsShortRead(stream, KFSp_PeekRenderContext(), time, flags, &read) || !KFSp_BringShort(read, &code))
        [[unlikely]]
        return ReadDoublesStaged(stream, time, flags, value, nullptr, nullptr);
    if (code != 0) [[unlikely]]
        return code;
    return KFSp_EndDoubles(stream, read.seen, KFSp_ValueData(read.data->cache), value);
}

void KFS_GetValueNoExpr(KFS_Stream const* stream, int time, unsigned char keyOnly, void* value, unsigned char* atKey,
                        void const* source, KFS_InterpFunc* interpFunc, long refcon)
{
    KFSp_ThrowIf(KFSp_CheckStream(KFSp_Op_GetValueNoExpr, stream, KFSp_Row_GetValue));
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    KFS_Stream const* const seen = data->stream;
    if (!BringCache(data, time, {keyOnly != 0, value != nullptr, atKey, interpFunc, refcon})) return;
    KFSp_ThrowIf(CopyExternalOut(seen, source ? source : KFSp_ValueData(data->cache), value));
}

void KFS_GetValueFNoExpr(KFS_Stream const* stream, int time, unsigned char keyOnly, double* value, unsigned char* atKey,
                         void const* source)
{
    KFSp_ThrowIf(KFSp_CheckStream(KFSp_Op_GetValueNoExpr, stream, KFSp_Row_GetValue));
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    KFS_Stream const* const seen = data->stream;
    if (seen->IsCustom()) throw KFSp_RefuseCustomValue(KFSp_Op_GetValuesFRefusal, KFSp_Row_ComputeFloatValues);
    if (!BringCache(data, time, {keyOnly != 0, value != nullptr, atKey})) return;
    KFSp_ThrowIf(KFSp_CopyDoublesOut(stream, seen, source ? source : KFSp_ValueData(data->cache), value));
}

namespace {

int GetValuesF(KFS_Stream const* stream, T_Time const* start, T_Time const* step, int count, int flags, char*** values)
{
    KFS_Stream const* const seen = KFSp_Seen(stream);
    if (seen->IsCustom()) return KFSp_RefuseCustomValue(KFSp_Op_GetValuesFRefusal, KFSp_Row_ComputeFloatValues);
    if (!values) {
        return Qp_ReportLegacyErrString(KFSp_ReportId(KFSp_Op_GetValuesFHandle), KFSp_Severity, KFS_Err_LegacyMismatch,
                                        nullptr);
    }
    std::size_t const number =
        count > 0 ? static_cast<std::size_t>(count) * static_cast<std::size_t>(seen->GetDimension()) : 0;
    char** const handle = Q_AllocateHandleClear(KFSp_ReportId(KFSp_Op_GetValuesFHandle),
                                                KFSp_MessageText(KFSp_Row_InterpolationArray), number * sizeof(double));
    if (!handle) return KFS_Err_OutOfMemory;
    T_Time const first = start ? *start : T_Time{0, seen->GetTimeScale()};
    int const code = KFSp_Boundary(
        [&] { return ReadSamples(stream, first, step, count, flags, reinterpret_cast<double*>(*handle)); });
    if (code != 0) {
        Q_FreeHandle(handle);
        return code;
    }
    *values = handle;
    return 0;
}

}  // namespace

int KFS_GetValuesFPlus(KFS_Stream const* stream, T_Time const* start, T_Time const* step, int count, int flags,
                       char*** values)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_GetFloat, stream, KFSp_Row_GetValue)) return code;
    return KFSp_Boundary([&] { return GetValuesF(stream, start, step, count, flags, values); });
}

int KFS_DisposeValue(KFS_Stream const* stream, void* value)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_DisposeValue, stream, KFSp_Row_Dispose)) return code;
    return KFSp_Boundary([&] {
        KFS_Stream const* const seen = KFSp_Seen(stream);
        KFS_DisposeItemFunc const dispose = seen->GetDisposeItemFunc();
        return dispose ? dispose(stream, seen->GetItemRefcon(), KFS_Item_KeyValue, value) : 0;
    });
}

// The vector's four components, and zero for what a value has beyond them.
void KFS_PostCacheVector4Value(KFS_Stream const* stream, int, M_Vector4T<double> const& vector, void* pointerValue,
                               void* value)
{
    if (pointerValue) {
        std::memcpy(value, &pointerValue, sizeof pointerValue);
        return;
    }
    KFS_Stream const* const seen = KFSp_Seen(stream);
    KFS_CopyItemFunc const copy = seen->IsCustom() ? KFSp_FakeCopyItemFunc : KFSp_ConvertItemFromFloat;
    std::size_t const size = seen->IsCustom() ? seen->GetValueDesc()->itemSize
                                              : static_cast<std::size_t>(seen->GetDimension()) * sizeof(double);
    KFSp_ScBytes const widened(std::max(size, sizeof vector.v));
    if (!widened.get()) throw int{KFS_Err_OutOfMemory};
    std::memcpy(widened.get(), vector.v, sizeof vector.v);
    KFSp_ThrowIf(copy(seen, 0, KFS_Item_CacheValue, widened.get(), value));
}

namespace {

// A buffer for one value, aligned to 16, that shows in the memory count. It takes an external value, and also the
// doubles that separated dimensions answer. Throws the int 4.
class ScratchValue {
public:
    // `seen`: the stream as this thread sees it.
    explicit ScratchValue(KFS_Stream const* seen)
        : size_(static_cast<std::size_t>(seen->GetDimension()) *
                std::max<std::size_t>(seen->GetValueDesc()->itemSize, sizeof(double))),
          buffer_(::operator new(size_, Alignment, std::nothrow))
    {
        if (!buffer_) throw int{KFS_Err_OutOfMemory};
        Q_AccountAllocationEx(size_, 1);
    }
    ~ScratchValue()
    {
        ::operator delete(buffer_, Alignment);
        Q_AccountAllocationEx(size_, 0);
    }
    ScratchValue(ScratchValue const&) = delete;
    ScratchValue& operator=(ScratchValue const&) = delete;
    void* get() const { return buffer_; }

private:
    static constexpr std::align_val_t Alignment{16};
    std::size_t size_;
    void* buffer_;
};

void ReadForSideEffect(KFS_Stream const* stream, T_Time const& time)
{
    ScratchValue const scratch(KFSp_Seen(stream));
    KFSp_ThrowIf(
        KFS_GetValuePlus(stream, &time, KFS_EvalFlag_NoExpression, scratch.get(), nullptr, nullptr, nullptr, 0));
    KFSp_ThrowIf(KFS_DisposeValue(stream, scratch.get()));
}

}  // namespace

void KFS_Stream::ValidateCacheAtTime(T_Time const& time)
{
    KFS_StreamKeyData const* const data = GetKeyData();
    if (data->stream->HasKeys()) {
        ReadForSideEffect(this, time);
        return;
    }
    int at = 0;
    KFSp_ThrowIf(KFSp_TimeInStream(data->stream, &time, &at));
    KFSp_MoveConstant(data, at);
}

void KFS_Stream::ForceInterpolateAtTime(T_Time const& time)
{
    ReadForSideEffect(this, time);
}
