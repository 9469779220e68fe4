#include "tree/listener.h"

#include "frame/boundary_private.h"
#include "frame/services/reports.h"
#include "frame/services/threads.h"
#include "frame/statics_private.h"
#include "tree/listener_private.h"
#include "tree/streambase.h"

#include <utility>

static KFS_StreamListenerManager* S_KFS_MainListenerManager = nullptr;

// Where this thread's pause flag stands, once it has one: each edit asks, and looking the flag up costs more than the
// edit at the end of a list.
static thread_local bool* knownPause = nullptr;

namespace {

bool& ThisThreadsPause()
{
    if (!knownPause) [[unlikely]] {
        boost::thread_specific_ptr<bool>& state = KFSp_GetMainListenerPauseState();
        if (!state.get()) state.reset(new bool(false));
        knownPause = state.get();
    }
    return *knownPause;
}

}  // namespace

void KFSp_FreeMainListenerPauseState(bool* state)
{
    knownPause = nullptr;
    delete state;
}

KFS_StreamListener::~KFS_StreamListener() = default;

void KFS_StreamListener::ReservedListenerOperation() {}

bool KFS_StreamListener::ListenOnThisThread() const
{
    return !mainThreadOnly || hearth::threads::CurrentThreadIsMainThread();
}

KFS_StreamListenerManager::~KFS_StreamListenerManager() = default;

void KFS_StreamListenerManager::NotifyAllListeners(KFS_Notification const& call)
{
    for (KFS_StreamListener* const listener : listeners_)
        if (listener->ListenOnThisThread()) call(listener);
}

int KFS_RegisterMainListener(KFS_StreamListener* listener)
{
    return KFSp_Boundary([&] { S_KFS_MainListenerManager->Add(listener); });
}

int KFS_UnregisterMainListener(KFS_StreamListener* listener)
{
    S_KFS_MainListenerManager->Remove(listener);
    return 0;
}

int KFS_PauseMainListener(bool pause, bool& wasPaused)
{
    return KFSp_Boundary([&] { wasPaused = std::exchange(ThisThreadsPause(), pause); });
}

bool KFSp_IsHeard(KFS_StreamBase* stream)
{
    if (stream->GetListenerState() == KFS_ListenerState_Silent) return false;
    if (Q_GetRunMode() == Q_RunMode_Silent || stream->IsCanonical() || ThisThreadsPause() || !S_KFS_MainListenerManager)
        return false;
    int state = stream->GetListenerState();
    if (state == KFS_ListenerState_Unknown) state = stream->ProbeListenerState();
    return state == KFS_ListenerState_Heard;
}

void KFS_NotifyListeners(KFS_StreamBase* stream, KFS_Notification const& call)
{
    KFSp_Notify(stream, call);
}

KFS_StreamListenerManager* KFSp_GetMainListenerManager()
{
    return S_KFS_MainListenerManager;
}

void KFSp_MakeMainListenerManager()
{
    S_KFS_MainListenerManager = new KFS_StreamListenerManager;
}

void KFSp_DestroyMainListenerManager() noexcept
{
    delete std::exchange(S_KFS_MainListenerManager, nullptr);
}
