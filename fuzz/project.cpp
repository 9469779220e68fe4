// A whole project: loaded from bytes, read, looked through by path, edited, saved, loaded and saved again, which must
// give the same bytes. Whatever the bytes are, an error is an answer, and a crash, a leak or a hang isn't.

#include "frame/services/memory.h"
#include "frame/services/reports.h"
#include "fuzz/streamuse.h"
#include "host/projectfile.h"
#include "host/session.h"

#include <cstdint>
#include <cstdlib>

using kfshost::AnimationGroup;
using kfshost::SceneGroup;

namespace {

using Bytes = std::vector<unsigned char>;

constexpr unsigned int MostChildren = 64;  // of a group that edits add to

// What a project may keep in memory beside itself: some, and so much for each byte of its file. The worst is a leaf of
// so many components that its one record takes 32 KB, of which a file says no more than their number.
constexpr long long KeptBytes = 65536;
constexpr long long KeptPerByte = 512;

std::unique_ptr<SceneGroup> Load(std::span<unsigned char const> bytes)
{
    try {
        return kfshost::LoadProjectFromMemory(bytes, "fuzzed");
    } catch (kfshost::ProjectError const&) {
        return nullptr;
    }
}

// A tree that edits have made may have what no file takes. What was saved is a project, and saving that one gives the
// same.
void ExpectRoundTrip(SceneGroup& tree, bool edited)
{
    ForgetNames(tree);
    Bytes first;
    try {
        first = kfshost::SaveProjectToMemory(tree, "saved");
    } catch (kfshost::ProjectError const&) {
        if (!edited) throw;
        return;
    }
    std::unique_ptr<SceneGroup> const again = kfshost::LoadProjectFromMemory(first, "saved");
    if (kfshost::SaveProjectToMemory(*again, "saved again") != first) std::abort();
}

// ---- reading

// Asks each leaf, and finds each node by the path that it says it has.
void Visit(SceneGroup const& tree, KFS_StreamBase const& node)
{
    KFS_StreamGroup const* root = nullptr;
    KFS_StreamIDPath path;
    node.SlowGetPathFromRootToMe(&root, &path);
    KFS_StreamIDPath same;
    same.SetFrom_JSON(path.GetAs_JSON());
    if (root != &tree || tree.FindStream(path) != &node || tree.FindStream(same) != &node) std::abort();
    if (KFS_Stream const* const leaf = node.GetAsLeaf()) {
        Ask(*leaf);
    } else if (KFS_StreamGroup const* const group = node.GetAsGroup()) {
        for (unsigned int i = 0; i < group->GetNumStreams(); ++i)
            if (KFS_StreamBase const* const child = group->GetStream(i); !child->IsCanonical()) Visit(tree, *child);
    }
}

// ---- editing

// One edit of a group's children.
void Edit(KFS_IndexedStreamGroup& group, Choices& choices)
{
    unsigned int const count = group.GetNumStreams();
    if (count > 0) {
        unsigned int const index = choices.Below(count);
        switch (choices.Below(4)) {
        case 0: delete group.RemoveStream(index); return;
        case 1: group.ReorderStreams(index, choices.Below(count)); return;
        case 2:
            group.GetEditableStream(index)->SetDisplayName(Q_AsciiToUTF16String(choices.Yes() ? "new" : ""));
            return;
        default: break;
        }
    }
    if (count < MostChildren) {
        if (count > 0 && choices.Yes())
            group.DuplicateStream(choices.Below(count));
        else if (auto* const scene = dynamic_cast<SceneGroup*>(&group))
            scene->AppendAnimation("added");
        else if (auto* const animation = dynamic_cast<AnimationGroup*>(&group))
            animation->AppendNode("added");
    }
}

// A few edits everywhere below a group.
void EditAll(KFS_StreamGroup& group, Choices& choices)
{
    if (KFS_IndexedStreamGroup* const list = group.GetAsIndexedGroup()) Edit(*list, choices);
    for (unsigned int i = 0; i < group.GetNumStreams(); ++i) {
        KFS_StreamBase* const child =
            choices.Below(4) == 0 ? group.GetEditableStream(i) : group.GetEditableStreamNullOK(i);
        if (!child) continue;
        if (KFS_Stream* const leaf = child->GetAsLeaf()) {
            for (unsigned int edits = choices.Below(4); edits > 0; --edits) {
                EditLeaf(*leaf, choices);
                Ask(*leaf);
            }
            if (KFS_NamedStreamGroup* const node = group.GetAsNamedGroup(); node && choices.Below(8) == 0)
                delete node->SwapCanonicalForStream(KFS_MatchName(leaf->GetMatchName()));
        } else if (KFS_StreamGroup* const inner = child->GetAsGroup()) {
            EditAll(*inner, choices);
        }
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size)
{
    kfshost::Session const session;  // one a run, so that nothing outlives it
    static Q_ReportSink const stderrSink = Q_SetReportSink([](Q_Report const&) {});

    long long const before = Q_MemoryLive(nullptr).bytes;
    std::unique_ptr<SceneGroup> const tree = Load({data, size});
    if (Q_MemoryLive(nullptr).bytes - before > KeptBytes + KeptPerByte * static_cast<long long>(size)) std::abort();
    if (!tree) return 0;
    ExpectRoundTrip(*tree, false);
    Visit(*tree, *tree);
    ExpectRoundTrip(*tree, false);
    Choices choices({data, size});
    EditAll(*tree, choices);
    Visit(*tree, *tree);
    ExpectRoundTrip(*tree, true);
    return 0;
}
