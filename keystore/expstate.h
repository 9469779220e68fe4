#pragma once

#include "frame/export.h"
#include "frame/services/context.h"
#include "keystore/stream.h"

#include <boost/shared_ptr.hpp>

// A stream's evaluation context, as the host's expression engine gives it.
class KFS_API KFS_ExprContext {
public:
    virtual ~KFS_ExprContext();
    // Whether the stream's expression can run now.
    virtual bool CanEvaluate() const = 0;
};

// How a render reads streams: the host implements it with its expression engine and puts one into each render context.
// The order of the virtual operations is part of the binary interface. All of them may throw an int or a
// std::exception.
class KFS_API KFS_ExpState : public Q_RenderState {
public:
    static hearth::utility::ImmutableString const S_StateName;

    hearth::utility::ImmutableString const& GetStateName() const override;
    ~KFS_ExpState() override;

    // Runs the stream's expression; `time` is in the stream's scale, `value` in external form. KFS_Err_ExprNoValue: no
    // value here.
    virtual void EvalExprValue(KFS_Stream const* stream, int time, int flags, void* value, KFS_ParamBag const* bag) = 0;
    // Reads from keys and overrides; ends in KFS_GetValueNoExpr.
    virtual void EvalNoExprValue(KFS_Stream const* stream, int time, int flags, void* value, unsigned char* atKey,
                                 KFS_ParamBag const* bag, KFS_InterpFunc* interpFunc, long refcon) = 0;
    // The same in doubles: as many as the dimension of the stream that the caller asked for, whatever a resolved target
    // has, since that is what the caller's buffer holds.
    virtual void EvalExprValueF(KFS_Stream const* stream, int time, int flags, double* value,
                                KFS_ParamBag const* bag) = 0;
    // Ends in KFS_GetValueFNoExpr.
    virtual void EvalNoExprValueF(KFS_Stream const* stream, int time, int flags, double* value, unsigned char* atKey,
                                  KFS_ParamBag const* bag) = 0;
    // May replace stream and time, and may fill `newBag` with overrides that hold for the expression.
    virtual void ResolveExprTarget(KFS_Stream const** stream, int* time, KFS_ParamBag const* bag,
                                   KFS_ParamBag* newBag) = 0;
    virtual boost::shared_ptr<KFS_ExprContext> GetExprContext(KFS_Stream const* stream) = 0;

    // Errors are being looked for rather than reported, and their number. Written through const by
    // KFS_DetectExpressionErrors.
    mutable bool detectingErrors = false;
    mutable int errorCount = 0;

protected:
    KFS_ExpState() = default;
};

// For a scope, expression errors are looked for rather than reported. Scopes nest; the end of the outermost clears the
// error count.
class KFS_API KFS_DetectExpressionErrors {
public:
    explicit KFS_DetectExpressionErrors(KFS_ExpState const* state);
    explicit KFS_DetectExpressionErrors(boost::shared_ptr<KFS_ExpState> const& state);
    ~KFS_DetectExpressionErrors();
    KFS_DetectExpressionErrors(KFS_DetectExpressionErrors const&) = delete;
    KFS_DetectExpressionErrors& operator=(KFS_DetectExpressionErrors const&) = delete;

private:
    KFS_ExpState const* state_;
    bool saved_;
};
