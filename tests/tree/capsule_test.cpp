#include "tests/support/groups.h"
#include "tests/support/text.h"

#include <atomic>
#include <thread>

// Where a stream stands, as a path and as a text, and what it inherits from its canonical instance.

namespace {

class Capsule : public SceneTest {
protected:
    TestRoot<TestIndexedGroup> root_{"layers"};

    static KFS_NamedStreamGroup* Transform(KFS_NamedStreamGroup* node)
    {
        return node->GetEditableStream(Name("transform"))->GetAsNamedGroup();
    }
    static KFS_StreamIDPath PathOf(KFS_StreamBase* stream)
    {
        KFS_StreamIDPath path;
        KFS_StreamGroup* root = nullptr;
        stream->SlowGetPathFromRootToMe(&root, &path);
        return path;
    }
};

TEST_F(Capsule, IdsAreTheRootsFollowedByThePath)
{
    AddNode(root_);
    KFS_NamedStreamGroup* const node = AddNode(root_);
    KFS_StreamBase* const scale = Transform(node)->GetEditableStream(Name("scale"));
    EXPECT_EQ(Text(R"(layers{"0":{"index":1,"matchName":"node"},"1":{"index":4294967295,"matchName":"transform"},)"
                   R"("2":{"index":4294967295,"matchName":"scale"}})"),
              scale->GetStreamCapsuleData().id);
    EXPECT_EQ(Text(R"(layers{"0":{"index":1,"matchName":"node"}})"), node->GetStreamCapsuleData().id);
    EXPECT_EQ(Text("layers{}"), root_.GetStreamCapsuleData().id);
    KFS_StreamGroup const* root = nullptr;
    KFS_StreamIDPath path(3);
    static_cast<KFS_StreamBase const*>(scale)->SlowGetPathFromRootToMe(&root, &path);
    EXPECT_EQ(&root_, root);
    EXPECT_EQ(path, scale->GetStreamCapsuleData().path);
    EXPECT_EQ(3u, path.GetLength());
    Q_ScAutoPtr<KFS_StreamBase> const alone = TestKinds::Make("opacity");
    EXPECT_EQ(Text("{}"), alone->GetStreamCapsuleData().id);
    alone->SlowGetPathFromRootToMe(&root, &path);
    EXPECT_EQ(nullptr, root) << "a leaf is no group";
    EXPECT_TRUE(path.IsEmpty());
    KFS_StreamCapsuleData const& canonical = Canonical("opacity")->GetStreamCapsuleData();
    EXPECT_EQ(Text("opacity"), canonical.id);
    EXPECT_TRUE(canonical.path.IsEmpty());
}

TEST_F(Capsule, IdsStayWhatTheyWereWhenFirstAsked)
{
    KFS_NamedStreamGroup* const first = AddNode(root_);
    KFS_NamedStreamGroup* const second = AddNode(root_);
    u16str const id = second->GetStreamCapsuleData().id;
    root_.ReorderStreams(1, 0);
    EXPECT_EQ(id, second->GetStreamCapsuleData().id);
    EXPECT_EQ(0u, PathOf(second).GetHead().GetIndex()) << "paths are looked for each time";
    EXPECT_EQ(id, first->GetStreamCapsuleData().id) << "asked first after the move";
    std::unique_ptr<KFS_StreamBase> const clone(second->Clone(true));
    EXPECT_EQ(Text("node{}"), clone->GetStreamCapsuleData().id) << "a copy stands elsewhere";
}

TEST_F(Capsule, ManyThreadsMayAskFirst)
{
    KFS_StreamBase const* const scale = Transform(AddNode(root_))->GetEditableStream(Name("scale"));
    std::array<KFS_StreamCapsuleData const*, 8> seen{};
    std::array<u16str, 8> ids;
    std::atomic<int> waiting{8};
    std::vector<std::thread> threads;
    for (std::size_t i = 0; i < seen.size(); ++i) {
        threads.emplace_back([&, i] {
            for (--waiting; waiting > 0;) {}
            seen[i] = &scale->GetStreamCapsuleData();
            ids[i] = seen[i]->id;
        });
    }
    for (std::thread& thread : threads) thread.join();
    for (std::size_t i = 0; i < seen.size(); ++i) {
        EXPECT_EQ(seen[0], seen[i]);
        EXPECT_EQ(scale->GetStreamCapsuleData().id, ids[i]);
    }
}

TEST_F(Capsule, TheHostsValueIsInheritedOnDemandAndKept)
{
    KFS_StreamBase* const canonical = Get_VX_StreamFactory()->GetCanonicalStream(Name("opacity"));
    Q_ScAutoPtr<KFS_StreamBase> const early = TestKinds::Make("opacity"), own = TestKinds::Make("opacity");
    EXPECT_TRUE(canonical->GetSMDataPath().empty());
    EXPECT_TRUE(early->GetSMDataPath().empty());
    canonical->SetSMDataPath(17);
    own->SetSMDataPath(5);
    EXPECT_EQ(17, boost::any_cast<int>(early->GetSMDataPath())) << "nothing was no answer to keep";
    EXPECT_EQ(5, boost::any_cast<int>(own->GetSMDataPath()));
    canonical->SetSMDataPath(18);
    EXPECT_EQ(17, boost::any_cast<int>(early->GetSMDataPath())) << "an answer is kept";
    std::unique_ptr<KFS_StreamBase> const clone(own->Clone(true));
    EXPECT_EQ(18, boost::any_cast<int>(clone->GetSMDataPath())) << "a copy asks anew";
    TestStream const withoutFactory;
    EXPECT_TRUE(withoutFactory->GetSMDataPath().empty());
}

TEST_F(Capsule, ANodeAsksItsOwnFactory)
{
    KFS_StreamFactory other;
    TestKinds kindsThere(&other);
    kindsThere.Leaf("only there", 1, 3.0);
    const std::unique_ptr<KFS_StreamBase> stream(other.CreateStream(Name("only there"), true, 600, true, false));
    EXPECT_EQ(other.GetCanonicalStream(Name("only there")), stream->GetCanonicalStream(Name("only there")));
    EXPECT_EQ(nullptr, stream->GetCanonicalStream(Name("opacity")));
    const std::unique_ptr<KFS_StreamBase> keyed(stream->CreateStream(Name("only there"), false, 30, true, false));
    EXPECT_EQ(1, keyed->GetAsLeaf()->GetKeyCount());
    EXPECT_EQ(30u, keyed->GetAsLeaf()->GetTimeScale());
    EXPECT_EQ(nullptr, stream->CreateStream(Name("opacity"), true, 600, false, false));
}

}  // namespace
