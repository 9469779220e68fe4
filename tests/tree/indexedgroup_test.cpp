#include "tree/indexedgroup.h"

#include "tests/support/groups.h"
#include "tests/support/notifications.h"

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
            for (unsigned int i = 0; i < group->GetNumStreams(); ++i) {
                letters += LetterOf(group->GetStream(i));
            }
            return letters;
        }
        KFS_IndexedStreamGroup* operator->() const { return group.get(); }

        std::unique_ptr<KFS_IndexedStreamGroup> group{TestKinds::Make("layers").release()->GetAsIndexedGroup()};
    };

    static Q_ScAutoPtr<KFS_StreamBase> Letter(char letter)
    {
        auto made = TestKinds::Make("opacity");
        const T_Time zero{0, 1};
        const double value = letter;
        EXPECT_EQ(0, KFS_InsertKeyF(made->GetAsLeaf(), &zero, 1, &value, 0, 0));
        return made;
    }
    static char LetterOf(KFS_StreamBase const* stream)
    {
        return static_cast<char>(static_cast<TestLeaf const*>(stream)->ValueAt(0));
    }
};

TEST_F(IndexedGroup, EditsMoveTheLaterChildren)
{
    struct Row {
        const char* what;
        std::function<void(List&)> edit;
        const char* after;  // of "abc"
    };
    const Row rows[] = {
        {"insert in front",
         [](List& l) {
             auto x = Letter('x');
             l->InsertStream(0, &x);
         },
         "xabc"},
        {"insert between",
         [](List& l) {
             auto x = Letter('x');
             l->InsertStream(2, &x);
         },
         "abxc"},
        {"insert at the end",
         [](List& l) {
             auto x = Letter('x');
             l->InsertStream(3, &x);
         },
         "abcx"},
        {"append",
         [](List& l) {
             auto x = Letter('x');
             EXPECT_EQ(3u, l->AppendStream(&x));
         },
         "abcx"},
        {"duplicate the first", [](List& l) { EXPECT_EQ('a', LetterOf(l->DuplicateStream(0))); }, "aabc"},
        {"duplicate the last", [](List& l) { EXPECT_EQ('c', LetterOf(l->DuplicateStream(2))); }, "abcc"},
        {"swap",
         [](List& l) {
             auto x = Letter('x');
             const Q_ScAutoPtr<KFS_StreamBase> left(l->SwapStream(1, &x));
             EXPECT_EQ('b', LetterOf(left.get()));
             EXPECT_EQ(nullptr, left->GetParent());
             EXPECT_EQ(nullptr, x.get());
         },
         "axc"},
        {"remove",
         [](List& l) {
             const Q_ScAutoPtr<KFS_StreamBase> left(l->RemoveStream(0));
             EXPECT_EQ('a', LetterOf(left.get()));
             EXPECT_EQ(nullptr, left->GetParent());
         },
         "bc"},
        {"remove a child",
         [](List& l) {
             const Q_ScAutoPtr<KFS_StreamBase> child(l->GetEditableStream(2u));
             EXPECT_TRUE(l->RemoveChild(child.get()));
             EXPECT_EQ(nullptr, child->GetParent());
             EXPECT_FALSE(l->RemoveChild(child.get()));
         },
         "ab"},
        {"reorder to the end", [](List& l) { l->ReorderStreams(0, 2); }, "bca"},
        {"reorder to the front", [](List& l) { l->ReorderStreams(2, 0); }, "cab"},
        {"reorder on the spot", [](List& l) { l->ReorderStreams(1, 1); }, "abc"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.what);
        List list("abc");
        row.edit(list);
        EXPECT_EQ(row.after, list.Letters());
        for (unsigned int i = 0; i < list->GetNumStreams(); ++i) {
            EXPECT_EQ(list.group.get(), list->GetStream(i)->GetParent());
            const KFS_StreamID id = list->SlowGetIDOfChild(list->GetStream(i));
            EXPECT_EQ(i, id.GetIndex());
            EXPECT_EQ(Name("opacity"), id.GetMatchName());
        }
    }
}

TEST_F(IndexedGroup, BadPlacesAndNamesAreRefusedAndLeaveTheListAlone)
{
    struct Row {
        const char* text;
        std::function<void(List&)> edit;
    };
    Q_ScAutoPtr<KFS_StreamBase> x = Letter('x'), foreign = TestKinds::Make("scale");
    const Row rows[] = {
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
    for (const Row& row : rows) {
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

TEST_F(IndexedGroup, LeavesAreToldFromGroups)
{
    List list("a");
    auto node = TestKinds::Make("node");
    list->AppendStream(&node);
    EXPECT_EQ(list->GetStream(0), list->GetLeafStream(0));
    EXPECT_EQ(list->GetStream(0), list->GetEditableLeafStream(0));
    EXPECT_EQ(nullptr, list->GetLeafStream(1));
    EXPECT_EQ(nullptr, list->GetEditableLeafStream(1));
}

TEST_F(IndexedGroup, AnyChildMakesItModified)
{
    List list("");
    EXPECT_FALSE(list->IsModified());
    auto node = TestKinds::Make("node");
    list->AppendStream(&node);
    EXPECT_FALSE(list->GetStream(0)->IsModified());
    EXPECT_TRUE(list->IsModified());
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
    const Q_ScAutoPtr<KFS_StreamBase> left(root.SwapStream(0, &swapped));
    EXPECT_EQ(25u, leaf->GetTimeScale());
    EXPECT_EQ(600u, Canonical("opacity")->GetAsLeaf()->GetTimeScale());
}

TEST_F(IndexedGroup, ADuplicateIsAWholeSubtreeOfItsOwn)
{
    List list("");
    auto made = TestKinds::Make("node");
    auto* const node = made->GetAsNamedGroup();
    list->AppendStream(&made);
    auto* const opacity = node->GetEditableLeafStream(Name("opacity"));
    ASSERT_EQ(0, opacity->SetConstant(false, true));
    auto* const copy = list->DuplicateStream(0)->GetAsNamedGroup();
    EXPECT_EQ(copy, list->GetStream(1));
    EXPECT_EQ(list.group.get(), copy->GetParent());
    auto* const its = copy->GetEditableLeafStreamNullOK(Name("opacity"));
    ASSERT_NE(nullptr, its);
    EXPECT_NE(opacity, its);
    EXPECT_TRUE(its->IsAnimated(false)) << "with its keys";
    EXPECT_EQ(Canonical("position"), copy->GetStream(2));
}

TEST_F(IndexedGroup, ACloneCopiesTheListInOrder)
{
    const List list("abc");
    const Q_ScAutoPtr<KFS_StreamBase> made(list->CloneStream(KFS_CloneStreamParams{true, true}));
    auto* const copy = made->GetAsIndexedGroup();
    ASSERT_EQ(3u, copy->GetNumStreams());
    for (unsigned int i = 0; i < 3; ++i) {
        EXPECT_NE(list->GetStream(i), copy->GetStream(i));
        EXPECT_EQ("abc"[i], LetterOf(copy->GetStream(i)));
        EXPECT_EQ(copy, copy->GetStream(i)->GetParent());
    }
    auto more = Letter('d');
    copy->AppendStream(&more);
    EXPECT_EQ("abc", list.Letters());
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
        const Q_ScAutoPtr<KFS_StreamBase> copy(list->CloneStream(KFS_CloneStreamParams{true, true}));
        EXPECT_EQ(canonical, copy->GetAsIndexedGroup()->GetStream(1)) << "a clone shares it";
    }
    EXPECT_EQ(nullptr, canonical->GetParent()) << "it outlives the list, and forgets it";
    EXPECT_TRUE(canonical->IsCanonical());
}

TEST_F(IndexedGroup, AStreamMovedPastTheEndIsLost)
{
    List list("abc");
    const Q_MemoryCount before = Q_MemoryLive(nullptr);
    ExpectBroken(reports, "invalid index for insert in indexed group", [&] { list->ReorderStreams(0, 3); });
    EXPECT_EQ("bc", list.Letters());
    EXPECT_LT(Q_MemoryLive(nullptr).bytes, before.bytes) << "and deleted";
    bool wasPaused = true;
    KFS_PauseMainListener(false, wasPaused);
    EXPECT_FALSE(wasPaused) << "the pause ends with the failure";
}

// Any run of edits against a plain string.
TEST_F(IndexedGroup, RandomEditsFollowAPlainList)
{
    std::mt19937 random(20240607);
    const auto upTo = [&random](std::size_t n) { return static_cast<unsigned int>(random() % (n + 1)); };
    const Q_MemoryCount before = Q_MemoryLive(nullptr);
    for (int run = 0; run < 20; ++run) {
        List list("");
        std::string model;
        for (int step = 0; step < 60; ++step) {
            const char letter = static_cast<char>('a' + random() % 26);
            const unsigned int kind = upTo(4);
            if (kind == 0 || model.empty()) {
                const unsigned int at = upTo(model.size());
                auto made = Letter(letter);
                list->InsertStream(at, &made);
                model.insert(at, 1, letter);
                continue;
            }
            const unsigned int at = upTo(model.size() - 1), to = upTo(model.size() - 1);
            if (kind == 1) {
                delete list->RemoveStream(at);
                model.erase(at, 1);
            } else if (kind == 2) {
                auto made = Letter(letter);
                delete list->SwapStream(at, &made);
                model[at] = letter;
            } else if (kind == 3) {
                list->DuplicateStream(at);
                model.insert(at + 1, 1, model[at]);
            } else {
                list->ReorderStreams(at, to);
                const char moved = model[at];
                model.erase(at, 1);
                model.insert(to, 1, moved);
            }
            ASSERT_EQ(model, list.Letters()) << "run " << run << " step " << step;
        }
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

// What a listener throws stops the edit where it is; no stream is lost or deleted twice.
TEST_F(IndexedGroup, AListenersFailureLosesNoStream)
{
    struct Row {
        const char* at;  // the record at which the listener throws
        std::function<void(KFS_IndexedStreamGroup&)> edit;
        unsigned int children;  // afterwards, of two
    };
    const auto insert = [](KFS_IndexedStreamGroup& list) {
        auto x = Letter('x');
        list.InsertStream(0, &x);
    };
    const auto swap = [](KFS_IndexedStreamGroup& list) {
        auto x = Letter('x');
        delete list.SwapStream(0, &x);
    };
    const auto remove = [](KFS_IndexedStreamGroup& list) { delete list.RemoveStream(0); };
    const Row rows[] = {
        {"before-insert", insert, 2}, {"after-insert", insert, 3},  {"before-swap", swap, 2},
        {"after-swap", swap, 2},      {"before-remove", remove, 2}, {"after-remove", remove, 1},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.at);
        const Q_MemoryCount before = Q_MemoryLive(nullptr);
        {
            TestRoot<TestIndexedGroup> root("layers");
            auto a = Letter('a'), b = Letter('b');
            root.AppendStream(&a);
            root.AppendStream(&b);
            {
                NotificationRecorder listener;
                listener.look = [&](KFS_StreamGroup*, KFS_StreamBase const*) -> std::string {
                    if (listener.Current().starts_with(row.at)) throw int{77};
                    return {};
                };
                EXPECT_EQ(77, KFSp_Boundary([&] { row.edit(root); }));
            }
            EXPECT_EQ(row.children, root.GetNumStreams());
        }
        EXPECT_EQ(before, Q_MemoryLive(nullptr));
    }
}

TEST_F(IndexedGroup, NoFailedAllocationLeavesAnythingBehind)
{
    struct Fixture {
        Fixture()
        {
            auto node = TestKinds::Make("node");
            node->GetAsNamedGroup()->GetEditableStream(Name("opacity"));
            list->AppendStream(&node);
        }
        List list{"a"};
    };
    const std::function<void(List&)> edits[] = {
        [](List& l) {
            const Q_ScAutoPtr<KFS_StreamBase> copy(l->CloneStream(KFS_CloneStreamParams{true, true}));
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
