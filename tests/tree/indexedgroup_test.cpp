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

TEST_F(IndexedGroup, AKindThatCantStandHereMeansACorruptProject)
{
    List list("a");
    list->SetDisplayName(Q_MBToUTF16String("Ebenen ^1"));
    auto foreign = TestKinds::Make("scale");
    EXPECT_EQ(3, KFSp_Boundary([&] { list->InsertStream(9, &foreign); })) << "the name is looked at before the index";
    EXPECT_EQ((std::vector<Reported>{{0, 8,
                                      "There was an error reading the Ebenen ^1 parameter group. The project file is "
                                      "corrupt. Skipping the layer.",
                                      0}}),
              reports.Take());
    EXPECT_NE(nullptr, foreign.get());
    EXPECT_EQ("a", list.Letters());
    TestIndexedGroup bare(Name("no kind"), Get_VX_StreamFactory(), false, {});
    EXPECT_EQ(3, KFSp_Boundary([&] { bare.InsertStream(0, &foreign); })) << "without a layout nothing can be stored";
    EXPECT_EQ(1u, reports.Take().size());
}

TEST_F(IndexedGroup, LeavesAreToldFromGroupsAndAnyChildMakesItModified)
{
    List list("");
    EXPECT_FALSE(list->IsModified());
    AddNode(*list.group);
    EXPECT_FALSE(list->GetStream(0)->IsModified());
    EXPECT_TRUE(list->IsModified());
    EXPECT_EQ(nullptr, list->GetLeafStream(0));
    EXPECT_EQ(nullptr, list->GetEditableLeafStream(0));
    auto leaf = Letter('a');
    list->AppendStream(&leaf);
    EXPECT_EQ(list->GetStream(1), list->GetLeafStream(1));
    EXPECT_EQ(list->GetStream(1), list->GetEditableLeafStream(1));
}

TEST_F(IndexedGroup, WhatComesInTakesTheScaleOfItsPlace)
{
    TestRoot<TestIndexedGroup> root("layers", 25);
    auto made = TestKinds::Make("node");
    auto* const node = made->GetAsNamedGroup();
    auto* const opacity = node->GetEditableLeafStream(Name("opacity"));
    EXPECT_EQ(600u, opacity->GetTimeScale());
    root.AppendStream(&made);
    EXPECT_EQ(25u, opacity->GetTimeScale());
    auto swapped = Letter('x');
    KFS_Stream const* const leaf = swapped->GetAsLeaf();
    Q_ScAutoPtr<KFS_StreamBase> const left(root.SwapStream(0, &swapped));
    EXPECT_EQ(25u, leaf->GetTimeScale());
    EXPECT_EQ(600u, Canonical("opacity")->GetAsLeaf()->GetTimeScale());
}

TEST_F(IndexedGroup, ADuplicateAndACloneAreWholeSubtreesOfTheirOwn)
{
    List list("ab");
    auto* const opacity = AddNode(*list.group)->GetEditableLeafStream(Name("opacity"));
    ASSERT_EQ(0, opacity->SetConstant(false, true));
    Q_ScAutoPtr<KFS_StreamBase> const made(list->CloneStream(KFS_CloneStreamParams{true, true}));
    auto* const copy = made->GetAsIndexedGroup();
    KFS_StreamBase const* const duplicate = list->DuplicateStream(2);
    EXPECT_EQ(duplicate, list->GetStream(3));
    for (auto const& [group, index] : {std::pair{list.group.get(), 3u}, {copy, 2u}}) {
        auto* const node = group->GetEditableStream(index)->GetAsNamedGroup();
        EXPECT_EQ(group, node->GetParent());
        auto* const its = node->GetEditableLeafStreamNullOK(Name("opacity"));
        ASSERT_NE(nullptr, its);
        EXPECT_NE(opacity, its);
        EXPECT_TRUE(its->IsAnimated(false)) << "with its keys";
        EXPECT_EQ(Canonical("position"), node->GetStream(2));
    }
    ASSERT_EQ(3u, copy->GetNumStreams());
    EXPECT_NE(list->GetStream(0), copy->GetStream(0));
    EXPECT_EQ('a', LetterOf(copy->GetStream(0)));
    EXPECT_EQ('b', LetterOf(copy->GetStream(1)));
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

TEST_F(IndexedGroup, AStreamMovedPastTheEndIsLostUnlessItIsTheFactorys)
{
    auto* const canonical = Get_VX_StreamFactory()->GetCanonicalStream(Name("opacity"));
    List list("ab");
    Q_ScAutoPtr<KFS_StreamBase> entry(canonical);
    list->AppendStream(&entry);
    ExpectBroken(reports, "invalid index for insert in indexed group", [&] { list->ReorderStreams(2, 3); });
    EXPECT_EQ("ab", list.Letters());
    EXPECT_EQ(100.0, static_cast<TestLeaf*>(canonical)->ValueAt(0));
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    ExpectBroken(reports, "invalid index for insert in indexed group", [&] { list->ReorderStreams(0, 2); });
    EXPECT_EQ("b", list.Letters());
    EXPECT_LT(Q_MemoryLive(nullptr).bytes, before.bytes) << "and deleted";
    bool wasPaused = true;
    KFS_PauseMainListener(false, wasPaused);
    EXPECT_FALSE(wasPaused) << "the pause ends with the failure";
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

// Any run of edits against a plain string.
TEST_F(IndexedGroup, RandomEditsFollowAPlainList)
{
    std::mt19937 random(20240607);
    auto const upTo = [&random](std::size_t n) { return static_cast<unsigned int>(random() % (n + 1)); };
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (int run = 0; run < 20; ++run) {
        List list("");
        std::string model;
        for (int step = 0; step < 60; ++step) {
            char const letter = static_cast<char>('a' + random() % 26);
            unsigned int const kind = model.empty() ? upTo(1) : upTo(6);
            unsigned int const at = upTo(kind == 0 ? model.size() : std::max<std::size_t>(model.size(), 1) - 1);
            auto made = Letter(letter);
            Q_ScAutoPtr<KFS_StreamBase> left;
            if (kind == 0) {
                list->InsertStream(at, &made);
                model.insert(at, 1, letter);
            } else if (kind == 1) {
                EXPECT_EQ(model.size(), list->AppendStream(&made));
                model += letter;
            } else if (kind == 2) {
                left.reset(list->SwapStream(at, &made));
                EXPECT_EQ(model[at], LetterOf(left.get()));
                model[at] = letter;
            } else if (kind == 3) {
                EXPECT_EQ(model[at], LetterOf(list->DuplicateStream(at)));
                model.insert(at + 1, 1, model[at]);
            } else if (kind == 4) {
                unsigned int const to = upTo(model.size() - 1);
                list->ReorderStreams(at, to);
                char const moved = model[at];
                model.erase(at, 1);
                model.insert(to, 1, moved);
            } else {
                left.reset(kind == 5 ? list->RemoveStream(at) : list->GetEditableStream(at));
                EXPECT_EQ(model[at], LetterOf(left.get()));
                EXPECT_EQ(kind == 6, list->RemoveChild(left.get()));
                model.erase(at, 1);
            }
            EXPECT_EQ(kind < 3, !made.get());
            EXPECT_TRUE(!left.get() || !left->GetParent());
            ASSERT_EQ(model, list.Letters()) << "run " << run << " step " << step;
            for (unsigned int i = 0; i < list->GetNumStreams(); ++i) {
                EXPECT_EQ(list.group.get(), list->GetStream(i)->GetParent());
                KFS_StreamID const id = list->SlowGetIDOfChild(list->GetStream(i));
                EXPECT_EQ((std::pair{i, Name("opacity")}), (std::pair{id.GetIndex(), id.GetMatchName()}));
            }
        }
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
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
