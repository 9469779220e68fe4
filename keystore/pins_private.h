#pragma once

#include "frame/boundary_private.h"
#include "keystore/keytypes.h"

// One pin of a list until the scope ends. `error` outlives it: it keeps a failed lock's code at once, and the unlock's
// if nothing failed before, so it is read after the pin is gone.
class KFSp_ScConstPin {
public:
    KFSp_ScConstPin(SEQ_Head const* const* list, KFSp_FirstError& error) noexcept : error_(error)
    {
        int const code = SEQ_LockConst(1, list);
        if (code == 0) list_ = list;  // a failed lock owes no unlock
        error_.Keep(code);
    }
    ~KFSp_ScConstPin()
    {
        if (list_) error_.Keep(SEQ_UnlockConst(list_));
    }
    KFSp_ScConstPin(KFSp_ScConstPin const&) = delete;
    KFSp_ScConstPin& operator=(KFSp_ScConstPin const&) = delete;

private:
    KFSp_FirstError& error_;
    SEQ_Head const* const* list_ = nullptr;
};

// The same on a list that is to be written.
class KFSp_ScPin {
public:
    KFSp_ScPin(SEQ_Head** list, KFSp_FirstError& error) noexcept : error_(error)
    {
        int const code = SEQ_Lock(1, list);
        if (code == 0) list_ = list;
        error_.Keep(code);
    }
    ~KFSp_ScPin()
    {
        if (list_) error_.Keep(SEQ_Unlock(list_));
    }
    // The pin outlives the scope.
    void Leave() noexcept { list_ = nullptr; }
    KFSp_ScPin(KFSp_ScPin const&) = delete;
    KFSp_ScPin& operator=(KFSp_ScPin const&) = delete;

private:
    KFSp_FirstError& error_;
    SEQ_Head** list_ = nullptr;
};

// One key of a list, taken for writing: the list is pinned until the scope ends. get() is null when the key couldn't be
// had.
class KFSp_ScKey {
public:
    KFSp_ScKey(SEQ_Head** list, int index, KFSp_FirstError& error) noexcept : error_(error)
    {
        void* item = nullptr;
        int const code = SEQ_GetAddress(list, index, 1, &item);
        if (code == 0) {
            list_ = list;
            key_ = static_cast<KFS_KeyScalar*>(item);
        }
        error_.Keep(code);
    }
    ~KFSp_ScKey()
    {
        if (list_) error_.Keep(SEQ_Unlock(list_));
    }
    KFSp_ScKey(KFSp_ScKey const&) = delete;
    KFSp_ScKey& operator=(KFSp_ScKey const&) = delete;

    KFS_KeyScalar* get() const noexcept { return key_; }
    KFS_KeyScalar* operator->() const noexcept { return key_; }

private:
    KFSp_FirstError& error_;
    SEQ_Head** list_ = nullptr;
    KFS_KeyScalar* key_ = nullptr;
};
