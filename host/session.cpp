#include "host/session.h"

#include "frame/frame.h"
#include "host/expressionengine_private.h"
#include "keystore/cachestate.h"
#include "keystore/evaluate.h"
#include "overrides/parambag.h"

#include <boost/make_shared.hpp>

#include <cstring>
#include <stdexcept>
#include <string>
#include <vector>

namespace kfshost {

namespace {

class ExprContext final : public KFS_ExprContext {
public:
    explicit ExprContext(bool canEvaluate) : canEvaluate_(canEvaluate) {}
    bool CanEvaluate() const override { return canEvaluate_; }

private:
    bool canEvaluate_;
};

// Layers and paths have no meaning here: nothing to fix up, nothing that depends on a place, and no identity of their
// own.
KFS_AppCallbacks HarmlessCallbacks()
{
    KFS_AppCallbacks callbacks;
    callbacks.oldPathFixupFunc = [](int, KFS_StreamIDPath*) {};
    callbacks.layerDefaultValueFunc = [](KFS_ParamLayerStream const*) -> void* { return nullptr; };
    callbacks.layerIndependentFunc = [](KFS_ParamLayerStream const*, bool) { return 0L; };
    callbacks.layerRenderGuidFunc = [](KFS_ParamLayerStream const*, KFS_RenderOptionsBase const&,
                                       GetRenderGuidFilter*) { return hearth::utility::Guid(); };
    callbacks.pathIndependentFunc = [](KFS_ParamPathStream const*, bool) { return 0; };
    callbacks.pathRenderGuidFunc = [](KFS_ParamPathStream const*, KFS_RenderOptionsBase const&, GetRenderGuidFilter*) {
        return hearth::utility::Guid();
    };
    return callbacks;
}

// What a bag says in place of a plain stream's keys, as the numbers of a record.
class Overridden {
public:
    Overridden(KFS_Stream const* stream, int time, KFS_ParamBag const* bag)
    {
        if (!bag) return;
        KFS_StreamOverride const* found = nullptr;
        if (bag->GetStreamOverride(stream, &found)) Take(*found, *stream->GetKeyData()->stream, time);
    }
    void const* Source() const { return source_; }

private:
    // `seen`: the stream as this thread's reads see it, and as `time` is meant.
    void Take(KFS_StreamOverride const& found, KFS_Stream const& seen, int time)
    {
        if (seen.IsCustom()) return;
        auto const dimension = static_cast<std::size_t>(seen.GetDimension());
        if (found.IsTimeInvariant()) {
            auto const* const fixed = boost::get<std::vector<double>>(&found.GetValue());
            if (!fixed) return;  // a text or another source, which isn't a plain stream's value
            source_ = fixed->data();
            if (fixed->size() >= dimension) return;
            numbers_ = *fixed;
        } else {
            KFS_OverrideValue value = found.GetValAtTime({time, seen.GetTimeScale()});
            auto* const numbers = boost::get<std::vector<double>>(&value);
            if (!numbers) return;
            numbers_.swap(*numbers);
        }
        numbers_.resize(dimension, 0.0);
        source_ = numbers_.data();
    }

    double const* source_ = nullptr;
    std::vector<double> numbers_;
};

void AddStates(Q_RenderContext& context)
{
    context.SetState(boost::make_shared<ExpState>());
    context.SetState(boost::make_shared<KFS_RenderState>());
    context.SetState(boost::make_shared<KFS_CapsuleOverrides>(&context));
    context.SetState(boost::make_shared<KFS_StreamCacheState>());
}

}  // namespace

namespace {

[[gnu::noinline]] void RefuseOverridden(KFS_Stream const* stream, int time, KFS_ParamBag const* bag)
{
    if (Overridden(stream, time, bag).Source()) throw static_cast<int>(KFS_Err_ExprNoValue);
}

// The numbers of a value as the caller's buffer holds them: by way of the stream's own conversion, unless it holds doubles.
void PutExternal(KFS_Stream const* stream, int time, double const* numbers, std::size_t count, void* value)
{
    KFS_Stream const& seen = *stream->GetKeyData()->stream;
    M_Vector4T<double> vector{};
    if (seen.GetValueDesc()->dataType == KFS_Type_Double) {
        std::memcpy(value, numbers, count * sizeof *numbers);
    } else if (count <= 4) {
        for (std::size_t i = 0; i < count; ++i) vector[static_cast<int>(i)] = numbers[i];
        KFS_PostCacheVector4Value(&seen, 0, vector, nullptr, value);
    } else {
        KFS_GetValueNoExpr(stream, time, false, value, nullptr, numbers, nullptr, 0);
    }
}

}  // namespace

// Keys that no bag overrides are read as they are. Expressions do nothing but compute.
ExpState::ExpState() : KFS_ExpState(KeyReads::Plain, ExprRuns::InPlace) {}

ExpState::~ExpState() = default;

void ExpState::EvalExprValue(KFS_Stream const* stream, int time, int flags, void* value, KFS_ParamBag const* bag)
{
    KFS_Stream const& seen = *stream->GetKeyData()->stream;
    if (seen.IsCustom()) throw static_cast<int>(KFS_Err_ExprNoValue);  // an expression gives numbers
    ExpressionEngine::Numbers numbers(static_cast<std::size_t>(seen.GetDimension()));
    EvalExprValueF(stream, time, flags, numbers.data(), bag);
    PutExternal(stream, time, numbers.data(), numbers.size(), value);
}

void ExpState::EvalExprValueF(KFS_Stream const* stream, int time, int flags, double* value, KFS_ParamBag const* bag)
{
    if (bag) [[unlikely]]
        RefuseOverridden(stream, time, bag);
    if (!engine_) [[unlikely]]
        engine_ = std::make_unique<ExpressionEngine>(*this);
    engine_->Evaluate(stream, time, flags, value, bag);
}

void ExpState::EvalNoExprValue(KFS_Stream const* stream, int time, int, void* value, unsigned char* atKey,
                               KFS_ParamBag const* bag, KFS_InterpFunc* interpFunc, long refcon)
{
    Overridden const overridden(stream, time, bag);
    KFS_GetValueNoExpr(stream, time, false, value, atKey, overridden.Source(), interpFunc, refcon);
}

void ExpState::EvalNoExprValueF(KFS_Stream const* stream, int time, int, double* value, unsigned char* atKey,
                                KFS_ParamBag const* bag)
{
    Overridden const overridden(stream, time, bag);
    KFS_GetValueFNoExpr(stream, time, false, value, atKey, overridden.Source());
}

void ExpState::ResolveExprTarget(KFS_Stream const**, int*, KFS_ParamBag const*, KFS_ParamBag*) {}

// A stream that was told of an error counts as without an expression. What is answered has no owner: it lives as long as the
// program, and renders share no count.
boost::shared_ptr<KFS_ExprContext> ExpState::GetExprContext(KFS_Stream const* stream)
{
    static ExprContext canRun(true);
    static ExprContext canNotRun(false);
    bool const isInError = stream->GetKeyData()->stream->HasExpressionError();
    return {boost::shared_ptr<KFS_ExprContext>(), isInError ? &canNotRun : &canRun};
}

std::vector<ExpressionError> ExpState::TakeErrors()
{
    return engine_ ? engine_->TakeErrors() : std::vector<ExpressionError>();
}

Project::Project()
{
    InitializeContexts();
    AddStates(*GetRenderContext(false));
}

boost::shared_ptr<Q_RenderContext> MakeRenderContext(bool tempClone)
{
    auto context = Q_RenderContext::MakeNewContext(tempClone);
    AddStates(*context);
    return context;
}

Session::Library::Library()
{
    if (int const code = KFS_Birth()) {
        static_cast<void>(KFS_Death());  // why it didn't start is what counts
        throw std::runtime_error("the library didn't start: error " + std::to_string(code));
    }
    KFS_AppCallbacks callbacks = HarmlessCallbacks();
    KFS_SetCallbacks(callbacks);
}

Session::Library::~Library()
{
    KFS_ClearCallbacks();
    static_cast<void>(KFS_Death());  // a destructor has nobody to tell
}

// The project owns its render context, so that reference shares the project's.
Session::Session()
    : project_(boost::make_shared<Project>()),
      currentContext_(project_->GetContext()),
      currentRenderContext_(boost::shared_ptr<Q_RenderContext>(project_, project_->GetRenderContext(false)))
{}

Session::~Session() = default;

}  // namespace kfshost
