#pragma once

#include "keystore/stream.h"
#include "tests/support/baregroup.h"
#include "tree/listener.h"

#include <gtest/gtest.h>

#include <functional>
#include <utility>

// A root whose streams are heard. It keeps leaves at the scale they have and doesn't own them; they must be gone first.
class HeardRoot : public BareGroup {
public:
    void Store(KFS_Stream* leaf)
    {
        timeScale_ = leaf->GetTimeScale();
        leaf->SetParent(this);
    }
    int ProbeListenerState() override { return KFS_ListenerState_Heard; }
    unsigned int GetPreferredTimeScale() const override { return timeScale_; }

private:
    unsigned int timeScale_ = 600;
};

// Counts the changes of value that it hears while it lives, and may do something about them.
class ValueListener : public KFS_StreamListener {
public:
    explicit ValueListener(std::function<void()> reaction = {}) : reaction_(std::move(reaction))
    {
        EXPECT_EQ(0, KFS_RegisterMainListener(this));
    }
    ~ValueListener() override { EXPECT_EQ(0, KFS_UnregisterMainListener(this)); }
    // Since the last call.
    int Take() { return std::exchange(count_, 0); }

    void StreamAboutToBeInserted(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int) override {}
    void StreamInserted(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int) override {}
    void StreamAboutToBeRemoved(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int) override {}
    void StreamRemoved(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int) override {}
    void StreamAboutToBeSwapped(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int) override {}
    void StreamSwapped(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int) override {}
    void StreamsAboutToBeReordered(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int, unsigned int) override {}
    void StreamsReordered(KFS_StreamGroup*, KFS_StreamBase const*, unsigned int, unsigned int) override {}
    void StreamDestroyed(KFS_StreamBase const*) override {}
    void StreamValueChanged(KFS_Stream*) override
    {
        ++count_;
        if (reaction_) reaction_();
    }
    void StreamFlagsChanged(KFS_StreamBase*, unsigned int, unsigned int) override {}
    void StreamDisplayNameChanged(KFS_StreamBase*) override {}

private:
    int count_ = 0;
    std::function<void()> reaction_;
};
