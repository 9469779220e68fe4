#pragma once

#include "tree/streamgroup.h"

#include <utility>

// A group without children, for tests that need a root or a parent and no more. Override what a test is about.
class BareGroup : public KFS_StreamGroup {
public:
    BareGroup() : KFS_StreamGroup(nullptr, nullptr, false) {}

    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const&) const override { return nullptr; }
    hearth::utility::Guid GetRenderGuid(KFS_RenderOptionsBase const&, GetRenderGuidFilter*) const override
    {
        return {};
    }
    unsigned int GetNumStreams() const override { return 0; }
    KFS_StreamBase* GetEditableStream(unsigned int index) override { return GetEditableStreamNullOK(index); }
    KFS_StreamBase const* GetStream(unsigned int) const override { return nullptr; }
    KFS_StreamBase* GetEditableStreamNullOK(unsigned int index) override
    {
        return const_cast<KFS_StreamBase*>(std::as_const(*this).GetEditableStreamNullOK(index));
    }
    KFS_StreamBase const* GetEditableStreamNullOK(unsigned int index) const override
    {
        KFS_StreamBase const* const child = GetStream(index);
        return child && child->IsCanonical() ? nullptr : child;
    }
    KFS_StreamBase const* GetStream(KFS_StreamID const& id) const override { return GetStream(id.GetIndex()); }
    KFS_StreamBase* GetEditableStream(KFS_StreamID const& id) override { return GetEditableStream(id.GetIndex()); }
    void ReadAndStore(KFS_MatchName const&, CKF_File*, CKF_ChunkInfo const*) override {}
    void FillCanonicalLayout(KFS_CanonicalLayout*) override {}
    KFS_StreamID SlowGetIDOfChild(KFS_StreamBase const* child) const override
    {
        unsigned int index = 0;
        while (index < GetNumStreams() && GetStream(index) != child) ++index;
        return KFS_StreamID(index, child->GetMatchName());
    }
    bool RemoveChild(KFS_StreamBase*) override { return false; }
};
