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
    // Ends in KFS_GetValueFNoExpr. Not called where the state has promised that this is all it does (KeyReads).
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

    // Whether the state has promised KeyReads::Plain.
    bool ReadsKeysPlainly() const { return keyReads_ == KeyReads::Plain; }
    // Whether the state has promised ExprRuns::InPlace.
    bool StaysInPlace() const { return exprRuns_ == ExprRuns::InPlace; }

protected:
    // What a state says of its EvalNoExprValue and EvalNoExprValueF.
    enum class KeyReads : unsigned char {
        Asked,  // they are called for each read
        // Without a bag they do nothing but call KFS_GetValueNoExpr and KFS_GetValueFNoExpr with what they were given, a
        // `keyOnly` of 0 and no `source`. So the library needn't call them for such reads, which costs less. A promise of
        // the class for all that derive from it.
        Plain,
    };
    // What a state says of the expressions that it runs.
    enum class ExprRuns : unsigned char {
        Held,  // one may have the state replaced in its render context, so each read holds a reference
        // None does anything to its render context, and no other thread does while one runs. A promise of the class, as
        // above.
        InPlace,
    };
    explicit KFS_ExpState(KeyReads keyReads = KeyReads::Asked, ExprRuns exprRuns = ExprRuns::Held)
        : keyReads_(keyReads),
          exprRuns_(exprRuns)
    {}

private:
    KeyReads keyReads_;
    ExprRuns exprRuns_;
};

// The state of a host that has no expression engine, and whose bags have no say over keys: every read is one of the keys.
class KFS_API KFS_KeysExpState final : public KFS_ExpState {
public:
    KFS_KeysExpState() : KFS_ExpState(KeyReads::Plain) {}

    // No expression has a value: both throw KFS_Err_ExprNoValue.
    void EvalExprValue(KFS_Stream const* stream, int time, int flags, void* value, KFS_ParamBag const* bag) override;
    void EvalExprValueF(KFS_Stream const* stream, int time, int flags, double* value, KFS_ParamBag const* bag) override;
    // The bag isn't looked at.
    void EvalNoExprValue(KFS_Stream const* stream, int time, int flags, void* value, unsigned char* atKey,
                         KFS_ParamBag const* bag, KFS_InterpFunc* interpFunc, long refcon) override;
    void EvalNoExprValueF(KFS_Stream const* stream, int time, int flags, double* value, unsigned char* atKey,
                          KFS_ParamBag const* bag) override;
    // Changes nothing.
    void ResolveExprTarget(KFS_Stream const** stream, int* time, KFS_ParamBag const* bag,
                           KFS_ParamBag* newBag) override;
    // Null: no expression can run.
    boost::shared_ptr<KFS_ExprContext> GetExprContext(KFS_Stream const* stream) override;
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
