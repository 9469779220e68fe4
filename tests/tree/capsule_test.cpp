#include "tests/support/groups.h"
#include "tests/support/text.h"

#include <atomic>
#include <thread>

// Where a stream stands, as a text, and what it inherits from its canonical instance.

namespace {

using Capsule = SceneTest;

TEST_F(Capsule, IdsAreTheRootsFollowedByThePathAndStay)
{
    TestRoot<TestIndexedGroup> root("layers");
    KFS_NamedStreamGroup* const first = AddNode(root);
    KFS_NamedStreamGroup* const node = AddNode(root);
    KFS_StreamBase const* const scale =
        node->GetEditableStream(Name("transform"))->GetAsNamedGroup()->GetEditableStream(Name("scale"));
    Q_ScAutoPtr<KFS_StreamBase> const alone = TestKinds::Make("opacity");
    std::pair<KFS_StreamBase const*, char const*> const rows[] = {
        {scale, R"(layers{"0":{"index":1,"matchName":"node"},"1":{"index":4294967295,"matchName":"transform"},)"
                R"("2":{"index":4294967295,"matchName":"scale"}})"},
        {node, R"(layers{"0":{"index":1,"matchName":"node"}})"},
        {&root, "layers{}"},
        {alone.get(), "{}"},
        {Canonical("opacity"), "opacity"},
    };
    std::unique_ptr<KFS_StreamBase> clone;
    for (bool const isMoved : {false, true}) {
        for (auto const& [stream, id] : rows) EXPECT_EQ(Text(id), stream->GetStreamCapsuleData().id);
        EXPECT_EQ(3u, scale->GetStreamCapsuleData().path.GetLength());
        EXPECT_TRUE(Canonical("opacity")->GetStreamCapsuleData().path.IsEmpty());
        if (isMoved) continue;
        root.ReorderStreams(1, 0);
        clone.reset(node->Clone(true));
    }
    EXPECT_EQ(Text(rows[1].second), first->GetStreamCapsuleData().id) << "asked first after the move";
    EXPECT_EQ(Text("node{}"), clone->GetStreamCapsuleData().id) << "a copy stands elsewhere";
    KFS_StreamGroup const* top = nullptr;
    KFS_StreamIDPath path(3);
    static_cast<KFS_StreamBase const*>(alone.get())->SlowGetPathFromRootToMe(&top, &path);
    EXPECT_TRUE(!top && path.IsEmpty()) << "a leaf is no group";
}

TEST_F(Capsule, ManyThreadsMayAskFirst)
{
    TestRoot<TestIndexedGroup> root("layers");
    KFS_StreamBase const* const node = AddNode(root);
    std::array<u16str, 8> ids;
    std::atomic<int> waiting{8};
    std::vector<std::thread> threads;
    for (u16str& id : ids) {
        threads.emplace_back([&] {
            for (--waiting; waiting > 0;) {}
            id = node->GetStreamCapsuleData().id;
        });
    }
    for (std::thread& thread : threads) thread.join();
    for (u16str const& id : ids) EXPECT_EQ(Text(R"(layers{"0":{"index":0,"matchName":"node"}})"), id);
}

TEST_F(Capsule, TheHostsValueIsInheritedOnDemandAndKept)
{
    KFS_StreamBase* const canonical = Get_VX_StreamFactory()->GetCanonicalStream(Name("opacity"));
    Q_ScAutoPtr<KFS_StreamBase> const early = TestKinds::Make("opacity"), own = TestKinds::Make("opacity");
    TestStream const withoutFactory;
    EXPECT_TRUE(canonical->GetSMDataPath().empty() && early->GetSMDataPath().empty());
    EXPECT_TRUE(withoutFactory->GetSMDataPath().empty());
    canonical->SetSMDataPath(17);
    own->SetSMDataPath(5);
    for (int i = 0; i < 2; ++i) {
        EXPECT_EQ(17, boost::any_cast<int>(early->GetSMDataPath())) << "nothing was no answer to keep; this one is";
        EXPECT_EQ(5, boost::any_cast<int>(own->GetSMDataPath()));
        canonical->SetSMDataPath(18);
    }
    std::unique_ptr<KFS_StreamBase> const clone(own->Clone(true));
    EXPECT_EQ(18, boost::any_cast<int>(clone->GetSMDataPath())) << "a copy asks anew";
}

}  // namespace
