#pragma once

#include "frame/project.h"
#include "host/expression.h"
#include "host/kinds.h"
#include "keystore/expstate.h"

#include <boost/shared_ptr.hpp>

#include <memory>
#include <vector>

namespace kfshost {

class ExpressionEngine;

// How this host's renders read streams: expressions (host/expression.h), what a bag overrides, and the keys. An override holds
// in place of an expression as of the keys.
class ExpState final : public KFS_ExpState {
public:
    ExpState();
    ~ExpState() override;

    void EvalExprValue(KFS_Stream const* stream, int time, int flags, void* value, KFS_ParamBag const* bag) override;
    void EvalNoExprValue(KFS_Stream const* stream, int time, int flags, void* value, unsigned char* atKey,
                         KFS_ParamBag const* bag, KFS_InterpFunc* interpFunc, long refcon) override;
    void EvalExprValueF(KFS_Stream const* stream, int time, int flags, double* value, KFS_ParamBag const* bag) override;
    void EvalNoExprValueF(KFS_Stream const* stream, int time, int flags, double* value, unsigned char* atKey,
                          KFS_ParamBag const* bag) override;
    void ResolveExprTarget(KFS_Stream const** stream, int* time, KFS_ParamBag const* bag,
                           KFS_ParamBag* newBag) override;
    boost::shared_ptr<KFS_ExprContext> GetExprContext(KFS_Stream const* stream) override;

    // The expressions that failed since this was last asked.
    std::vector<ExpressionError> TakeErrors();

private:
    std::unique_ptr<ExpressionEngine> engine_;  // made with the first expression
};

// A project with a context and a render context that is ready for reads.
class Project : public KFS_Project {
public:
    Project();
};

// A render context with the four states that reads and overrides look for. `tempClone`: for one render's private use,
// whose reads then work on copies of the key data and leave the streams alone.
boost::shared_ptr<Q_RenderContext> MakeRenderContext(bool tempClone);

// The library, started for as long as this object lives, with a project whose contexts are current on the thread that
// made it. One at a time, made and destroyed on the main thread; streams must be gone before it is.
class Session {
public:
    // Throws std::runtime_error when the library can't start.
    Session();
    ~Session();
    Session(Session const&) = delete;
    Session& operator=(Session const&) = delete;

    Project& GetProject() const { return *project_; }

private:
    // Started first, stopped last.
    struct Library {
        Library();
        ~Library();
        Library(Library const&) = delete;
        Library& operator=(Library const&) = delete;
    };

    Library library_;
    SceneKinds kinds_;
    boost::shared_ptr<Project> project_;
    Q_ScSetCurrentContext currentContext_;
    Q_ScSetCurrentRenderContext currentRenderContext_;
};

}  // namespace kfshost
