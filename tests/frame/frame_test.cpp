#include "frame/frame.h"

#include "frame/boundary_private.h"
#include "frame/frame_private.h"
#include "frame/services/memory.h"
#include "tests/support/reports.h"
#include "tree/listener.h"

#include <stdexcept>
#include <tuple>

namespace {

using Logged = std::tuple<int, std::string, std::string, std::string>;

TEST(Frame, LifeCycleIsLoggedAndLeavesNothingBehind)
{
    std::vector<Logged> log;
    Q_LogSink const previous = Q_SetLogSink([&log](auto... parts) { log.emplace_back(parts...); });
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    EXPECT_EQ(nullptr, Get_VX_StreamFactory());
    EXPECT_EQ(0, KFS_Birth());
    EXPECT_NE(nullptr, Get_VX_StreamFactory());
    EXPECT_EQ(0, KFS_Death());
    EXPECT_EQ(nullptr, Get_VX_StreamFactory());
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
    EXPECT_EQ(0, KFS_Death()) << "without a birth before it";
    Q_SetLogSink(previous);
    std::vector<Logged> const expected = {
        {10, "KFS", "Birth", "KFS Birth"}, {10, "KFS", "Birth", "KFS StreamBase Birth"},
        {10, "KFS", "Death", "KFS Death"}, {10, "KFS", "Death", "KFS StreamBase Death"},
        {10, "KFS", "Death", "KFS Death"}, {10, "KFS", "Death", "KFS StreamBase Death"},
    };
    EXPECT_EQ(expected, log);
}

TEST(Frame, BirthWithoutMemoryAnswers4AndDeathCleansUp)
{
    ReportRecorder reports;
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    int failures = 0;
    for (bool fired = true; fired;) {
        Q_FailAllocation(failures + 1);
        int const code = KFS_Birth();
        fired = Q_FailAllocationFired();
        Q_FailAllocation(0);
        EXPECT_EQ(fired ? 4 : 0, code);
        failures += fired ? 1 : 0;
        EXPECT_EQ(0, KFS_Death());
        EXPECT_EQ(before, Q_MemoryLive(nullptr));
        reports.Take();
        ASSERT_LT(failures, 20);
    }
    EXPECT_GE(failures, 2) << "the factory and the listener manager are tracked objects";
}

TEST(Frame, CallbacksAreCopiedAndCleared)
{
    KFS_AppCallbacks callbacks;
    callbacks.pathIndependentFunc = [](KFS_ParamPathStream const*, bool independent) { return independent ? 5 : 6; };
    KFS_SetCallbacks(callbacks);
    callbacks.pathIndependentFunc = nullptr;
    ASSERT_NE(nullptr, KFSp_GetCallbacks().pathIndependentFunc);
    EXPECT_EQ(5, KFSp_GetCallbacks().pathIndependentFunc(nullptr, true));
    KFS_ClearCallbacks();
    EXPECT_EQ(nullptr, KFSp_GetCallbacks().pathIndependentFunc);
}

TEST(Boundary, TurnsWhatIsThrownIntoAResult)
{
    ReportRecorder reports;
    EXPECT_EQ(7, KFSp_Boundary([] { return 7; }));
    EXPECT_EQ(0, KFSp_Boundary([] {}));
    EXPECT_EQ(7427, KFSp_Boundary([]() -> int { throw 7427; }));
    EXPECT_NO_REPORT(reports);
    EXPECT_EQ(4, KFSp_Boundary([]() -> int { throw std::bad_alloc(); }));
    EXPECT_NE(0, KFSp_Boundary([]() -> int { throw std::runtime_error("engine stalled"); }));
    std::vector<Reported> const seen = reports.Take();
    ASSERT_EQ(2u, seen.size());
    EXPECT_EQ("engine stalled", seen[1].text);
    EXPECT_THROW(static_cast<void>(KFSp_Boundary([] { throw 'x'; })), char);
}

}  // namespace
