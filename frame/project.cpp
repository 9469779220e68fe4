#include "frame/project.h"

#include <boost/make_shared.hpp>

KFS_Project::~KFS_Project() = default;

void KFS_Project::InitializeContexts()
{
    context_.reset();
    renderContext_.reset();
    context_ = KFS_Context::MakeNewContext(this);
    renderContext_ = Q_RenderContext::MakeNewContext(false);
}

Q_RenderContext* KFS_Project::GetRenderContext(bool useCurrent) const
{
    if (useCurrent) {
        if (Q_RenderContext* const current = Q_RenderContext::PeekCurrent()) return current;
    }
    return renderContext_.get();
}

KFS_Context::~KFS_Context() = default;

boost::shared_ptr<KFS_Context> KFS_Context::MakeNewContext(KFS_Project* project)
{
    return boost::make_shared<KFS_Context>(project);
}

KFS_Project* KFS_Context::GetCurrentProject()
{
    return KFS_GetCurrentProject();
}

KFS_Project* KFS_GetCurrentProject()
{
    auto const* const context = dynamic_cast<KFS_Context*>(Q_Context::PeekCurrent());
    return context ? context->GetProject() : nullptr;
}

KFS_Project const* KFS_GetCurrentConstProject()
{
    return KFS_GetCurrentProject();
}

KFS_Project const* KFS_GetConstProject(KFS_Project const* project, bool)
{
    return project ? project : KFS_GetCurrentConstProject();
}

KFS_Project* KFS_GetProject(KFS_Project* project, bool)
{
    return project ? project : KFS_GetCurrentProject();
}

hearth::utility::ImmutableString const& KFS_RenderState::GetStateName() const
{
    return S_StateName;
}

KFS_RenderState::~KFS_RenderState() = default;

KFS_RenderState::Suspension KFS_RenderState::SuspendAutoDecanonicalize()
{
    return boost::make_shared<hearth::utility::ScSetReset<bool>>(&autoDecanonicalizeSuspended_, true);
}
