#pragma once

#include "frame/export.h"
#include "frame/services/memory.h"

#include <boost/function.hpp>

#include <set>

class KFS_Stream;
class KFS_StreamBase;
class KFS_StreamGroup;

// Told when a stream's value, flags, name or place changes. The host derives from it and registers one object; the
// order of the virtual operations is part of the binary interface. A listener must not unregister itself from inside a
// notification.
//
// It may edit the tree from inside one, the group of which it is told too: the edit that is told of then goes on from
// what the group holds. It must not delete what it is given, the group or the stream, before the notification has
// reached all listeners, and a stream that it has taken out of the group is its own.
//
// Only streams below a root that wants to be heard are heard (KFS_StreamBase::ProbeListenerState), and never a
// canonical instance.
class KFS_API KFS_StreamListener {
public:
    virtual ~KFS_StreamListener();
    virtual void StreamAboutToBeInserted(KFS_StreamGroup* group, KFS_StreamBase const* stream, unsigned int index) = 0;
    virtual void StreamInserted(KFS_StreamGroup* group, KFS_StreamBase const* stream, unsigned int index) = 0;
    virtual void StreamAboutToBeRemoved(KFS_StreamGroup* group, KFS_StreamBase const* stream, unsigned int index) = 0;
    virtual void StreamRemoved(KFS_StreamGroup* group, KFS_StreamBase const* stream, unsigned int index) = 0;
    // The stream is the one that comes.
    virtual void StreamAboutToBeSwapped(KFS_StreamGroup* group, KFS_StreamBase const* stream, unsigned int index) = 0;
    virtual void StreamSwapped(KFS_StreamGroup* group, KFS_StreamBase const* stream, unsigned int index) = 0;
    virtual void StreamsAboutToBeReordered(KFS_StreamGroup* group, KFS_StreamBase const* stream, unsigned int from,
                                           unsigned int to) = 0;
    virtual void StreamsReordered(KFS_StreamGroup* group, KFS_StreamBase const* stream, unsigned int from,
                                  unsigned int to) = 0;
    // The stream is in its destructor.
    virtual void StreamDestroyed(KFS_StreamBase const* stream) = 0;
    // Not called; it keeps the later ones in their places.
    virtual void ReservedListenerOperation();
    // Value, keys or expression changed.
    virtual void StreamValueChanged(KFS_Stream* stream) = 0;
    virtual void StreamFlagsChanged(KFS_StreamBase* stream, unsigned int oldFlags, unsigned int newFlags) = 0;
    virtual void StreamDisplayNameChanged(KFS_StreamBase* stream) = 0;

    bool ListenOnThisThread() const;

    // Hears only notifications sent on the main thread.
    bool mainThreadOnly = false;
};

using KFS_Notification = boost::function<void(KFS_StreamListener*)>;

// The set of listeners, which it doesn't own.
class KFS_API KFS_StreamListenerManager : public Q_MemTrackedObject {
public:
    virtual ~KFS_StreamListenerManager();

    void Add(KFS_StreamListener* listener) { listeners_.insert(listener); }
    void Remove(KFS_StreamListener* listener) { listeners_.erase(listener); }
    // Calls `call` for each listener that listens on this thread, in the order of their addresses. An empty call throws
    // boost::bad_function_call at the first one.
    void NotifyAllListeners(KFS_Notification const& call);

private:
    std::set<KFS_StreamListener*> listeners_;
};

// Between KFS_Birth and KFS_Death. Registering one listener twice leaves one entry; an unknown one is passed over. They
// return 0.
[[nodiscard]] KFS_API int KFS_RegisterMainListener(KFS_StreamListener* listener);
[[nodiscard]] KFS_API int KFS_UnregisterMainListener(KFS_StreamListener* listener);
// Silences the calling thread, or not; `wasPaused` gets what was before, for the caller to restore. Returns 0.
[[nodiscard]] KFS_API int KFS_PauseMainListener(bool pause, bool& wasPaused);

// Tells all listeners, if anybody hears this stream.
KFS_API void KFS_NotifyListeners(KFS_StreamBase* stream, KFS_Notification const& call);
