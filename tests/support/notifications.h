#pragma once

#include "tests/support/groups.h"
#include "tree/listener.h"

#include <gtest/gtest.h>

#include <functional>
#include <map>
#include <string>
#include <vector>

// Writes down every notification that it hears while it lives, with all arguments: "before-insert layers a 0". Streams
// go by the label that the test gave them, else by their match name.
class NotificationRecorder : public KFS_StreamListener {
public:
    NotificationRecorder() { EXPECT_EQ(0, KFS_RegisterMainListener(this)); }
    ~NotificationRecorder() override { EXPECT_EQ(0, KFS_UnregisterMainListener(this)); }

    void Label(KFS_StreamBase const* stream, std::string const& label) { labels_[stream] = label; }
    // All since the last call, in order.
    std::vector<std::string> Take() { return std::exchange(heard_, {}); }
    // The notification that is being told. To be called from `look`.
    std::string const& Current() const { return heard_.back(); }

    // Every notification that begins so throws 77 from now on.
    void ThrowAt(std::string const& start)
    {
        look = [this, start](KFS_StreamGroup*, KFS_StreamBase const*) -> std::string {
            if (Current().starts_with(start)) throw int{77};
            return {};
        };
    }

    void StreamAboutToBeInserted(KFS_StreamGroup* g, KFS_StreamBase const* s, unsigned int i) override
    {
        Child("before-insert", g, s, i);
    }
    void StreamInserted(KFS_StreamGroup* g, KFS_StreamBase const* s, unsigned int i) override
    {
        Child("after-insert", g, s, i);
    }
    void StreamAboutToBeRemoved(KFS_StreamGroup* g, KFS_StreamBase const* s, unsigned int i) override
    {
        Child("before-remove", g, s, i);
    }
    void StreamRemoved(KFS_StreamGroup* g, KFS_StreamBase const* s, unsigned int i) override
    {
        Child("after-remove", g, s, i);
    }
    void StreamAboutToBeSwapped(KFS_StreamGroup* g, KFS_StreamBase const* s, unsigned int i) override
    {
        Child("before-swap", g, s, i);
    }
    void StreamSwapped(KFS_StreamGroup* g, KFS_StreamBase const* s, unsigned int i) override
    {
        Child("after-swap", g, s, i);
    }
    void StreamsAboutToBeReordered(KFS_StreamGroup* g, KFS_StreamBase const* s, unsigned int from,
                                   unsigned int to) override
    {
        Child("before-reorder", g, s, from, " " + std::to_string(to));
    }
    void StreamsReordered(KFS_StreamGroup* g, KFS_StreamBase const* s, unsigned int from, unsigned int to) override
    {
        Child("after-reorder", g, s, from, " " + std::to_string(to));
    }
    void StreamDestroyed(KFS_StreamBase const* s) override { Hear("destroyed " + Called(s), nullptr, s); }
    void StreamValueChanged(KFS_Stream* s) override { Hear("value " + Called(s), nullptr, s); }
    void StreamFlagsChanged(KFS_StreamBase* s, unsigned int oldFlags, unsigned int newFlags) override
    {
        Hear("flags " + Called(s) + " " + std::to_string(oldFlags) + " " + std::to_string(newFlags), nullptr, s);
    }
    void StreamDisplayNameChanged(KFS_StreamBase* s) override { Hear("name " + Called(s), nullptr, s); }

    // What to add to each record: how the tree looks from inside the notification. The group is null where there is
    // none. May throw.
    std::function<std::string(KFS_StreamGroup* group, KFS_StreamBase const* stream)> look;
    // Names a stream in place of the labels, if set.
    std::function<std::string(KFS_StreamBase const*)> called;

private:
    std::string Called(KFS_StreamBase const* stream) const
    {
        if (called) return called(stream);
        auto const found = labels_.find(stream);
        return found != labels_.end() ? found->second : NameOf(stream);
    }
    void Child(char const* what, KFS_StreamGroup* group, KFS_StreamBase const* stream, unsigned int index,
               std::string const& more = {})
    {
        std::string text = std::string(what) + " " + Called(group) + " ";  // the group is named first
        text += Called(stream) + " " + std::to_string(index) + more;
        Hear(std::move(text), group, stream);
    }
    void Hear(std::string text, KFS_StreamGroup* group, KFS_StreamBase const* stream)
    {
        heard_.push_back(std::move(text));
        if (look) heard_.back() += look(group, stream);
    }

    std::map<KFS_StreamBase const*, std::string> labels_;
    std::vector<std::string> heard_;
};

using Notifications = std::vector<std::string>;
