#include "host/session.h"

#include "frame/frame.h"
#include "frame/services/strings.h"
#include "keystore/cachestate.h"
#include "keystore/edit.h"
#include "tests/host/hosttest.h"

TEST(Session, StartsTheLibraryAndLeavesNothingBehind)
{
    EXPECT_EQ(nullptr, Get_VX_StreamFactory());
    {
        kfshost::Session const session;
        EXPECT_NE(nullptr, Get_VX_StreamFactory());
        EXPECT_EQ(&session.GetProject(), KFS_GetCurrentProject());
        EXPECT_EQ(session.GetProject().GetRenderContext(false), Q_RenderContext::PeekCurrent());
    }
    EXPECT_EQ(nullptr, Get_VX_StreamFactory());
    EXPECT_EQ(nullptr, KFS_GetCurrentProject());
    EXPECT_EQ(nullptr, Q_RenderContext::PeekCurrent());
}

TEST_F(HostTest, EveryRenderContextHasTheStatesThatReadsLookFor)
{
    for (bool const tempClone : {false, true}) {
        auto const context = kfshost::MakeRenderContext(tempClone);
        EXPECT_EQ(tempClone, context->GetIsTempCloneContext());
        EXPECT_NE(nullptr, dynamic_cast<KFS_ExpState*>(context->PeekState(KFS_ExpState::S_StateName)));
        EXPECT_NE(nullptr, dynamic_cast<KFS_RenderState*>(context->PeekState(KFS_RenderState::S_StateName)));
        EXPECT_NE(nullptr, dynamic_cast<KFS_CapsuleOverrides*>(context->PeekState(KFS_CapsuleOverrides::S_StateName)));
        EXPECT_NE(nullptr, dynamic_cast<KFS_StreamCacheState*>(context->PeekState(KFS_StreamCacheState::S_StateName)));
    }
}

// A render with a clone context of its own goes on reading what was there when it began.
TEST_F(HostTest, ARendersOwnContextKeepsItsKeys)
{
    kfshost::StreamBuilder builder(1, 24, "opacity");
    double const before = 40.0, after = 90.0;
    builder.Append(0, &before, KFS_Interp_Linear, KFS_Interp_Linear);
    auto const stream = builder.Take();
    auto const render = kfshost::MakeRenderContext(true);
    auto const readInRender = [&] {
        Q_ScSetCurrentRenderContext const current(render);
        return ReadOne(*stream, kfshost::Rational(5, 1));
    };
    EXPECT_EQ(40.0, readInRender());
    T_Time const end{48, 24};
    ASSERT_EQ(0, KFS_InsertKeyF(stream.get(), &end, false, &after, KFS_Interp_Linear, KFS_Interp_Linear));
    EXPECT_EQ(40.0, readInRender());
    EXPECT_EQ(90.0, ReadOne(*stream, kfshost::Rational(5, 1)));
}
