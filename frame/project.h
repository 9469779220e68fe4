#pragma once

#include "frame/export.h"
#include "frame/services/context.h"
#include "frame/services/memory.h"
#include "frame/services/scoped.h"

#include <boost/shared_ptr.hpp>

class KFS_Context;
class KFS_ParamBag;
class KFS_StreamBase;

// The owner of a stream tree, subclassed by the host, with the two ideas of place that its code runs in: a context that
// says which project it is, and a render context that carries named per-render states.
class KFS_API KFS_Project : public Q_MemTrackedObject {
public:
    KFS_Project() = default;
    virtual ~KFS_Project();
    KFS_Project(KFS_Project const&) = delete;
    KFS_Project& operator=(KFS_Project const&) = delete;

    // Replaces both contexts with new ones. Which states the new render context needs is the host's affair.
    void InitializeContexts();
    // The host's number.
    int GetProjectKind() const { return projectKind_; }
    // With `useCurrent` the thread's current render context if there is one; else the project's own. Not owned by the
    // caller.
    Q_RenderContext* GetRenderContext(bool useCurrent) const;
    boost::shared_ptr<KFS_Context> const& GetContext() const { return context_; }

protected:
    void SetProjectKind(int kind) { projectKind_ = kind; }

private:
    boost::shared_ptr<KFS_Context> context_;
    boost::shared_ptr<Q_RenderContext> renderContext_;
    int projectKind_ = 0;
};

// A context that belongs to a project. The project isn't owned and outlives it.
class KFS_API KFS_Context final : public Q_Context {
public:
    static boost::shared_ptr<KFS_Context> MakeNewContext(KFS_Project* project);
    static KFS_Project* GetCurrentProject();

    explicit KFS_Context(KFS_Project* project) : project_(project) {}
    ~KFS_Context() override;
    KFS_Project* GetProject() const { return project_; }

private:
    KFS_Project* project_;
};

// The calling thread's project: null without a current context, or when that belongs to no project.
KFS_API KFS_Project* KFS_GetCurrentProject();
KFS_API KFS_Project const* KFS_GetCurrentConstProject();
// A real stream's own project; else, and where it has none, the current one. The flag isn't used.
KFS_API KFS_Project const* KFS_GetConstProject(KFS_StreamBase const* stream, bool);
KFS_API KFS_Project* KFS_GetProject(KFS_StreamBase* stream, bool);
// The given project, or the current one. The flag isn't used.
KFS_API KFS_Project const* KFS_GetConstProject(KFS_Project const* project, bool);
KFS_API KFS_Project* KFS_GetProject(KFS_Project* project, bool);

// Per-render switches.
// Threads: touched by the code of one render at a time.
class KFS_API KFS_RenderState : public Q_RenderState {
public:
    static hearth::utility::ImmutableString const S_StateName;
    hearth::utility::ImmutableString const& GetStateName() const override;
    ~KFS_RenderState() override;

    using Suspension = boost::shared_ptr<hearth::utility::ScSetReset<bool>>;
    // Suspends until the last reference goes, which restores what was before: suspensions nest.
    Suspension SuspendAutoDecanonicalize();
    bool GetAutoDecanonicalizeIsSuspended() const { return autoDecanonicalizeSuspended_; }

private:
    bool autoDecanonicalizeSuspended_ = false;
};

// The overrides of a capsule, per render.
class KFS_API KFS_CapsuleOverrides : public Q_RenderState {
public:
    static hearth::utility::ImmutableString const S_StateName;
    // The context isn't kept.
    explicit KFS_CapsuleOverrides(Q_RenderContext* context);
    hearth::utility::ImmutableString const& GetStateName() const override;
    ~KFS_CapsuleOverrides() override;
    KFS_CapsuleOverrides(KFS_CapsuleOverrides const&) = delete;
    KFS_CapsuleOverrides& operator=(KFS_CapsuleOverrides const&) = delete;

    // Owned by this state.
    KFS_ParamBag* GetCapsuleParamBag() { return bag_.get(); }
    // Arms `scope` on the owned bag, which restores the content at its end, and replaces the content.
    void SetScopedCapsuleParamBag(Q_ScSetReset<KFS_ParamBag>& scope, KFS_ParamBag const& bag);
    // The same with the union of the owned bag and `bag`, in which the owned one wins.
    void MergeInScopedCapsuleParamBag(Q_ScSetReset<KFS_ParamBag>& scope, KFS_ParamBag const& bag);

private:
    Q_ScAutoPtr<KFS_ParamBag> bag_;
};
