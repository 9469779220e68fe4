#include "tests/support/notifications.h"

#include "curves/floatkeys.h"
#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "keystore/attributes.h"
#include "keystore/keyflags.h"
#include "tree/listener_private.h"

#include <algorithm>
#include <functional>
#include <thread>

namespace {

using NotificationsTest = SceneTest;

// A list of two opacities, a and b, with x outside; each edit begins anew.
struct ListScene {
    explicit ListScene(NotificationRecorder& recorder)
    {
        for (auto* const made : {&a, &b, &x}) *made = TestKinds::Make("opacity");
        recorder.Label(a.get(), "a");
        recorder.Label(b.get(), "b");
        recorder.Label(x.get(), "x");
        root.AppendStream(&a);
        root.AppendStream(&b);
        recorder.Take();
    }
    Q_ScAutoPtr<KFS_StreamBase> a, b, x;
    TestRoot<TestIndexedGroup> root{"layers"};
};

// Every edit of a leaf: heard once, at its end, if it changed the stream, and not at all where it was refused.
TEST_F(NotificationsTest, OfEditsOfALeaf)
{
    struct Row {
        char const* edit;
        std::function<int(KFS_Stream*)> act;
        Notifications heard;
        bool spatial = false;
    };
    static T_Time const at{150, 600}, last{300, 600};
    static double const value[3] = {7.0, 8.0, 9.0}, half[3] = {0.5, 0.5, 0.5};
    const Notifications once{"value leaf"};
    Row const rows[] = {
        {"insert a key", [](KFS_Stream* s) { return KFS_InsertKeyF(s, &at, 0, value, 0, 0); }, once},
        {"replace a key", [](KFS_Stream* s) { return KFS_InsertKey(s, &last, 1, value, 0, 0); }, once},
        {"set a key", [](KFS_Stream* s) { return KFS_SetKeyF(s, 0, value, 0, 0); }, once},
        {"remove a key", [](KFS_Stream* s) { return KFS_RemoveKey(s, 0, nullptr); }, once},
        {"move a key: it leaves, it comes, it has moved",
         [](KFS_Stream* s) { return KFS_SetKeyTime(s, 1, &at, 0, nullptr, nullptr); },
         {"value leaf", "value leaf", "value leaf"}},
        {"move an end key, whose free side is reset",
         [](KFS_Stream* s) { return KFS_SetKeyTime(s, 0, &at, 0, nullptr, nullptr); },
         {"value leaf", "value leaf", "value leaf", "value leaf"}},
        {"move a key to where it is", [](KFS_Stream* s) { return KFS_SetKeyTime(s, 1, &last, 0, nullptr, nullptr); },
         once},
        {"key flags",
         [](KFS_Stream* s) { return KFS_SetKeyFlags(s, 0, KFS_KeyFlag_Modifiable, KFS_KeyFlag_Modifiable); }, once},
        {"velocity", [](KFS_Stream* s) { return KFS_SetKeyVelocityF(s, 0, value, value); }, once},
        {"influence", [](KFS_Stream* s) { return KFS_SetKeyInfluence(s, 0, half, half); }, once},
        {"graph tangents", [](KFS_Stream* s) { return KFS_SetKeyTangentsF(s, 0, half, half, half, half, 1.0); }, once},
        {"multiplier", [](KFS_Stream* s) { return KFS_SetStreamMultiplier(s, value, nullptr); }, once, true},
        {"multiplier, asked for only",
         [](KFS_Stream* s) {
             double old[4];
             return KFS_SetStreamMultiplier(s, nullptr, old);
         },
         {},
         true},
        {"to a constant", [](KFS_Stream* s) { return s->SetConstant(1, 0); }, once},
        {"to a constant, whose value is set and removed",
         [](KFS_Stream* s) {
             return s->SetConstant(1, 0) + KFS_InsertKey(s, &at, 0, value, 0, 0) + KFS_RemoveKey(s, 0, nullptr);
         },
         {"value leaf", "value leaf", "value leaf"}},
        {"to keys, which it has", [](KFS_Stream* s) { return s->SetConstant(0, 0); }, {}},
        {"display name", [](KFS_Stream* s) { return s->SetDisplayName(Q_MBToUTF16String("n")), 0; }, {"name leaf"}},
        {"display name without telling",
         [](KFS_Stream* s) { return s->pSetDisplayName(Q_MBToUTF16String("n")), 0; },
         {}},
        {"flags", [](KFS_Stream* s) { return s->SetHidden(true), 0; }, {"flags leaf 1 3"}},
        {"flags that are so already", [](KFS_Stream* s) { return s->SetActive(true), 0; }, {}},
        {"flags under no mask", [](KFS_Stream* s) { return s->SetStreamBaseFlags(0xFFFFFFFF, 0), 0; }, {}},
        {"the canonical bit, there and back",
         [](KFS_Stream* s) { return s->SetCanonical(true), s->SetCanonical(false), 0; },
         {}},
        {"space tangents", [](KFS_Stream* s) { return KFS_SetKeySpaceTangentsF(s, 0, 0, value, value); }, once, true},
        {"s-parametrize", [](KFS_Stream* s) { return KFS_SetStreamSParametrize(s, 1); }, once, true},
        {"space tangents of what has none",
         [](KFS_Stream* s) { return KFS_SetKeySpaceTangentsF(s, 0, 0, value, value); },
         {}},
        {"a key that isn't there", [](KFS_Stream* s) { return KFS_RemoveKey(s, 9, nullptr); }, {}},
        {"to set one that isn't there", [](KFS_Stream* s) { return KFS_SetKey(s, 9, value, 0, 0); }, {}},
        {"a key in the way", [](KFS_Stream* s) { return KFS_InsertKeyF(s, &last, 0, value, 0, 0); }, {}},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(row.edit);
        NotificationRecorder recorder;
        TestRoot<TestIndexedGroup> root("layers");
        StreamOptions options;
        options.dimension = row.spatial ? 2 : 1;
        options.spatial = row.spatial;
        TestStream leaf(options);
        leaf->SetParent(&root);
        recorder.Label(leaf, "leaf");
        for (int const time : {0, 300, 600}) leaf.Key(time, {time / 100.0, 1.0}, KFS_Interp_Spline);
        recorder.Take();
        int const code = row.act(leaf);
        EXPECT_EQ(row.heard, recorder.Take()) << "code " << code;
        EXPECT_TRUE(code != 0 || reports.Take().empty());
        reports.Take();
        EXPECT_TRUE(code == 0 || row.heard.empty()) << code;
    }
}

TEST_F(NotificationsTest, AThreadPausesForItselfOnly)
{
    NotificationRecorder recorder;
    ListScene scene(recorder);
    bool was = true, other = false;
    EXPECT_EQ(0, KFS_PauseMainListener(true, was));
    EXPECT_FALSE(was);
    scene.root.ReorderStreams(0, 1);
    scene.root.AppendStream(&scene.x);
    EXPECT_EQ(Notifications{}, recorder.Take());
    std::thread([&] {
        bool inside = true;
        EXPECT_EQ(0, KFS_PauseMainListener(false, inside));
        EXPECT_FALSE(inside) << "a thread begins unpaused";
        scene.root.ReorderStreams(0, 1);
    }).join();
    EXPECT_EQ(2u, recorder.Take().size()) << "that one did hear its edits";
    EXPECT_EQ(0, KFS_PauseMainListener(was, other));
    EXPECT_TRUE(other) << "the reorder left the pause that it found";
    delete scene.root.RemoveStream(2);
    EXPECT_EQ((Notifications{"before-remove layers x 2", "after-remove layers x 2"}), recorder.Take());
}

TEST_F(NotificationsTest, AListenerMayKeepToTheMainThread)
{
    NotificationRecorder anywhere, mainOnly;
    mainOnly.mainThreadOnly = true;
    ListScene scene(anywhere);
    mainOnly.Take();
    std::thread([&] { scene.root.ReorderStreams(0, 1); }).join();
    EXPECT_EQ(2u, anywhere.Take().size());
    EXPECT_EQ(Notifications{}, mainOnly.Take());
    scene.root.ReorderStreams(0, 1);
    EXPECT_EQ(2u, anywhere.Take().size());
    EXPECT_EQ(2u, mainOnly.Take().size());
}

TEST_F(NotificationsTest, AListenerIsRegisteredOnce)
{
    NotificationRecorder recorder;
    ListScene scene(recorder);
    EXPECT_EQ(0, KFS_RegisterMainListener(&recorder));
    scene.root.SetHidden(true);
    EXPECT_EQ((Notifications{"flags layers 1 3"}), recorder.Take());
    EXPECT_EQ(0, KFS_UnregisterMainListener(&recorder));
    scene.root.SetHidden(false);
    EXPECT_EQ(Notifications{}, recorder.Take());
    EXPECT_EQ(0, KFS_UnregisterMainListener(&recorder)) << "an unknown one is passed over";
}

TEST_F(NotificationsTest, AnEmptyCallIsRefusedAtTheFirstListener)
{
    TestRoot<TestIndexedGroup> root("layers");
    EXPECT_NO_THROW(KFS_NotifyListeners(&root, KFS_Notification())) << "nobody listens";
    NotificationRecorder const recorder;
    EXPECT_THROW(KFS_NotifyListeners(&root, KFS_Notification()), boost::bad_function_call);
}

TEST_F(NotificationsTest, AListenersFailureEndsTheEditAndTheOthersTurn)
{
    NotificationRecorder first, second;
    NotificationRecorder& early = &first < &second ? first : second;
    NotificationRecorder& late = &first < &second ? second : first;
    TestRoot<TestNamedGroup> root("node");
    early.ThrowAt("");
    EXPECT_EQ(77, KFSp_Boundary([&] { root.GetEditableStream(Name("opacity")); }));
    EXPECT_EQ(Notifications{}, late.Take());
    EXPECT_EQ(Canonical("opacity"), root.GetStream(0)) << "nothing had changed before the first notification";
    early.look = {};
}

// What is told, as a call that counts how often it is put into the form that listeners get.
struct CountedCall {
    explicit CountedCall(int& copies) : copies_(&copies) {}
    CountedCall(CountedCall const& other) : copies_(other.copies_) { ++*copies_; }
    void operator()(KFS_StreamListener*) const {}

private:
    int* copies_;
};

TEST_F(NotificationsTest, NothingIsPutTogetherForASilentTree)
{
    NotificationRecorder const recorder;
    TestRoot<TestIndexedGroup> heard("layers");
    auto const silent = MakeNode();
    int copies = 0;
    KFSp_Notify(silent.get(), CountedCall(copies));
    EXPECT_EQ(0, copies);
    KFSp_Notify(&heard, CountedCall(copies));
    EXPECT_NE(0, copies);
}

TEST_F(NotificationsTest, EditsOfASilentTreeTakeNoMemory)
{
    NotificationRecorder const recorder;
    auto const node = MakeNode();
    auto* const opacity = node->GetEditableLeafStream(Name("opacity"));
    Q_FailAllocation(1);
    opacity->SetHidden(true);
    opacity->NotifyValueChanged();
    Q_ScAutoPtr<KFS_StreamBase> const left(node->SwapCanonicalForStream(Name("opacity")));
    EXPECT_FALSE(Q_FailAllocationFired());
    Q_FailAllocation(0);
    EXPECT_EQ(opacity, left.get());
}

}  // namespace
