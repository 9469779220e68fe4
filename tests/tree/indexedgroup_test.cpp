#include "tree/indexedgroup.h"

#include "tests/support/chunklines.h"
#include "tests/support/groups.h"
#include "tree/listener.h"

#include <functional>
#include <random>

namespace {

class IndexedGroup : public SceneTest {
protected:
    // A list of single opacities, each with its place in `letters` as its value, so that they can be told apart.
    struct List {
        explicit List(std::string const& letters)
        {
            for (char const letter : letters) {
                auto made = Letter(letter);
                group->AppendStream(&made);
            }
        }
        std::string Letters() const
        {
            std::string letters;
            for (unsigned int i = 0; i < group->GetNumStreams(); ++i) letters += LetterOf(group->GetStream(i));
            return letters;
        }
        KFS_IndexedStreamGroup* operator->() const { return group.get(); }

        std::unique_ptr<KFS_IndexedStreamGroup> group{TestKinds::Make("layers").release()->GetAsIndexedGroup()};
    };

    static Q_ScAutoPtr<KFS_StreamBase> Letter(char letter)
    {
        auto made = TestKinds::Make("opacity");
        T_Time const zero{0, 1};
        double const value = letter;
        EXPECT_EQ(0, KFS_InsertKeyF(made->GetAsLeaf(), &zero, 1, &value, 0, 0));
        return made;
    }
    static char LetterOf(KFS_StreamBase const* stream)
    {
        return static_cast<char>(static_cast<TestLeaf const*>(stream)->ValueAt(0));
    }
};

TEST_F(IndexedGroup, BadPlacesAndNamesAreRefusedAndLeaveTheListAlone)
{
    struct Row {
        char const* text;
        std::function<void(List&)> edit;
    };
    Q_ScAutoPtr<KFS_StreamBase> x = Letter('x'), foreign = TestKinds::Make("scale");
    Row const rows[] = {
        {"invalid index for insert in indexed group", [&](List& l) { l->InsertStream(3, &x); }},
        {"invalid index for swap in indexed group", [&](List& l) { l->SwapStream(2, &x); }},
        {"invalid name for storing in this named group", [&](List& l) { l->SwapStream(0, &foreign); }},
        {"invalid index for remove in indexed group", [&](List& l) { l->RemoveStream(2); }},
        {"invalid index in indexed group", [&](List& l) { l->DuplicateStream(2); }},
        {"invalid index in indexed group", [&](List& l) { l->ReorderStreams(2, 0); }},
        {"invalid index in indexed group", [&](List& l) { l->GetStream(2); }},
        {"invalid index in indexed group", [&](List& l) { l->GetEditableStream(0xFFFFFFFF); }},
        {"invalid index in indexed group", [&](List& l) { l->GetEditableStreamNullOK(2); }},
        {"invalid index in indexed group", [&](List& l) { l->GetLeafStream(2); }},
        {"index must be specified for lookup in indexed group",
         [&](List& l) { l->GetStream(KFS_StreamID(Name("opacity"))); }},
        {"index must be specified for lookup in indexed group", [&](List& l) { l->GetEditableStream(KFS_StreamID()); }},
        {"stream at index has wrong matchname", [&](List& l) { l->GetStream(KFS_StreamID(1, Name("node"))); }},
        {"stream at index has wrong matchname", [&](List& l) { l->GetEditableStream(KFS_StreamID(1, Name("node"))); }},
        {"child not found in parent", [&](List& l) { l->SlowGetIDOfChild(x.get()); }},
    };
    List list("ab");
    for (Row const& row : rows) {
        ExpectBroken(reports, row.text, [&] { row.edit(list); });
        EXPECT_EQ("ab", list.Letters());
    }
    EXPECT_NE(nullptr, x.get());
    EXPECT_EQ(nullptr, x->GetParent());
    EXPECT_NE(nullptr, foreign.get());
    EXPECT_EQ('b', LetterOf(list->GetStream(KFS_StreamID(1))));
    EXPECT_EQ('b', LetterOf(list->GetEditableStream(KFS_StreamID(1, Name("opacity")))));
}

TEST_F(IndexedGroup, ACanonicalEntryStaysTheFactorys)
{
    auto* const canonical = Get_VX_StreamFactory()->GetCanonicalStream(Name("opacity"));
    {
        List list("a");
        Q_ScAutoPtr<KFS_StreamBase> entry(canonical);
        list->AppendStream(&entry);
        EXPECT_EQ(canonical, list->GetEditableStream(1u)) << "there is no upgrade here";
        EXPECT_EQ(canonical, list->GetEditableStreamNullOK(1u));
        EXPECT_EQ(list.group.get(), canonical->GetParent());
        Q_ScAutoPtr<KFS_StreamBase> const copy(list->CloneStream(KFS_CloneStreamParams{true, true}));
        EXPECT_EQ(canonical, copy->GetAsIndexedGroup()->GetStream(1)) << "a clone shares it";
        Q_MemoryCount const before = Q_MemoryLive(nullptr);
        EXPECT_FALSE(list->DuplicateStream(1)->IsCanonical());
        delete list->RemoveStream(2);
        EXPECT_EQ(before.blocks, Q_MemoryLive(nullptr).blocks) << "a duplicate is the list's own";
    }
    EXPECT_EQ(nullptr, canonical->GetParent()) << "it outlives the list, and forgets it";
    EXPECT_TRUE(canonical->IsCanonical());
}

TEST_F(IndexedGroup, AGroupWithoutAFactoryReadsNoChildren)
{
    const MemoryFile file([](CKF_File* out) { List("a")->Write(out); });
    TestIndexedGroup group(Name("layers"), nullptr, false, {});
    file.Read([&](CKF_File* in) {
        ExpectBroken(reports, "asked a property without a factory for a property type",
                     [&] { group.Read(in, nullptr); });
    });
    EXPECT_EQ(0u, group.GetNumStreams());
}

TEST_F(IndexedGroup, NoFailedAllocationLeavesAnythingBehind)
{
    struct Fixture {
        Fixture() { AddNode(*list.group)->GetEditableStream(Name("opacity")); }
        List list{"a"};
    };
    const std::function<void(List&)> edits[] = {
        [](List& l) {
            delete l->CloneStream(KFS_CloneStreamParams{true, true});
        },
        [](List& l) { delete (l->DuplicateStream(1), l->RemoveStream(2)); },
        [](List& l) { l->ReorderStreams(0, 1); },
    };
    for (auto const& edit : edits) {
        FailEveryAllocation([] { return std::make_unique<Fixture>(); }, [&](Fixture& f) { return edit(f.list), 0; },
                            [&](Fixture& f, int, Q_MemoryCount const& before) {
                                reports.Take();
                                EXPECT_EQ(2u, f.list->GetNumStreams());
                                // The list's vector may have grown.
                                EXPECT_LE(Q_MemoryLive(nullptr).blocks, before.blocks);
                            });
    }
}

}  // namespace
