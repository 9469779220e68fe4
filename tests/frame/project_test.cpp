#include "frame/project.h"

#include "host/session.h"
#include "keystore/cachestate.h"
#include "overrides/parambag.h"
#include "tests/support/streams.h"
#include "tree/streamgroup.h"

namespace {

class ForeignContext : public Q_Context {};

class Projects : public StreamTest {};

TEST_F(Projects, TheCurrentProjectIsTheThreadsContexts)
{
    EXPECT_EQ(&session.GetProject(), KFS_GetCurrentProject());
    EXPECT_EQ(&session.GetProject(), KFS_GetCurrentConstProject());
    {
        Q_ScSetCurrentContext const foreign(boost::shared_ptr<Q_Context>(new ForeignContext));
        EXPECT_EQ(nullptr, KFS_GetCurrentProject()) << "a context that belongs to no project";
    }
    {
        Q_ScSetCurrentContext const none{boost::shared_ptr<Q_Context>()};
        EXPECT_EQ(nullptr, KFS_GetCurrentProject());
    }
    kfshost::Project other;
    EXPECT_EQ(&other, KFS_GetProject(&other, false));
    EXPECT_EQ(&session.GetProject(), KFS_GetProject(static_cast<KFS_Project*>(nullptr), false));
    EXPECT_EQ(&session.GetProject(), KFS_GetProject(static_cast<KFS_StreamBase*>(nullptr), false));
    EXPECT_EQ(&session.GetProject(), KFS_GetConstProject(TestStream().get(), true)) << "a stream without a parent";

    Q_RenderContext* const own = other.GetRenderContext(false);
    EXPECT_NE(own, Q_RenderContext::PeekCurrent());
    EXPECT_EQ(Q_RenderContext::PeekCurrent(), other.GetRenderContext(true));
    for (char const* const name : {"ExpState", "RenderState", "KFS_CapsuleOverrides", "KFS_StreamCacheState"})
        EXPECT_NE(nullptr, own->PeekState(hearth::utility::ImmutableString::Create(name))) << name;
    Q_ScSetCurrentRenderContext const none{boost::shared_ptr<Q_RenderContext>()};
    EXPECT_EQ(own, other.GetRenderContext(true)) << "the current one, if there is one and it is asked for";

    boost::shared_ptr<KFS_Context> const context = other.GetContext();
    other.InitializeContexts();
    EXPECT_NE(context, other.GetContext()) << "initializing again replaces both";
    EXPECT_EQ(&other, other.GetContext()->GetProject());
    EXPECT_EQ(nullptr, other.GetRenderContext(false)->PeekState(KFS_ExpState::S_StateName))
        << "states are the host's affair";
}

TEST_F(Projects, DetectingErrorsAndSuspensionsNest)
{
    kfshost::ExpState state;
    KFS_RenderState render;
    state.errorCount = 3;
    {
        KFS_DetectExpressionErrors const outer(&state);
        KFS_RenderState::Suspension const suspended = render.SuspendAutoDecanonicalize();
        {
            KFS_DetectExpressionErrors const inner(&state);
            KFS_RenderState::Suspension const again = render.SuspendAutoDecanonicalize(), copy = again;
            state.errorCount = 5;
        }
        EXPECT_TRUE(state.detectingErrors && state.errorCount == 5 && render.GetAutoDecanonicalizeIsSuspended());
    }
    EXPECT_TRUE(!state.detectingErrors && state.errorCount == 0) << "the outermost clears the count";
    EXPECT_FALSE(render.GetAutoDecanonicalizeIsSuspended());
}

// A bag with entries for streams of these names, to see contents come and go.
class FilledBag : public KFS_ParamBag {
public:
    explicit FilledBag(std::initializer_list<char const*> names)
    {
        for (char const* const name : names) {
            TestStream const stream;  // a canonical instance is known by its name
            stream->SetMatchName(KFS_MatchName(name, false));
            stream->SetCanonical(true);
            AddOverride(stream, nullptr);
        }
    }
};

TEST_F(Projects, CapsuleBagsAreReplacedAndMergedForAScope)
{
    KFS_CapsuleOverrides overrides(nullptr);
    EXPECT_EQ(0u, overrides.GetCapsuleParamBag()->GetOverrideCount());
    {
        Q_ScSetReset<KFS_ParamBag> first;
        overrides.SetScopedCapsuleParamBag(first, FilledBag{"a", "b"});
        EXPECT_EQ(2u, overrides.GetCapsuleParamBag()->GetOverrideCount());
        {
            Q_ScSetReset<KFS_ParamBag> second;
            overrides.MergeInScopedCapsuleParamBag(second, FilledBag{"b", "c"});
            EXPECT_EQ(3u, overrides.GetCapsuleParamBag()->GetOverrideCount());
        }
        EXPECT_EQ(2u, overrides.GetCapsuleParamBag()->GetOverrideCount());
    }
    EXPECT_EQ(0u, overrides.GetCapsuleParamBag()->GetOverrideCount());
}

}  // namespace
