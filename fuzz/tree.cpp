// A group of the library's own kinds of streams, which hold more than numbers: read from bytes, asked, edited, written,
// read and written again, which must give the same bytes. Whatever the bytes are, an error is an answer, and a crash, a
// leak or a hang isn't.

#include "frame/services/chunkfile.h"
#include "frame/services/reports.h"
#include "fuzz/streamuse.h"
#include "fuzz/treekinds.h"
#include "host/session.h"

#include <cstdlib>
#include <memory>
#include <optional>

using fuzzkinds::TreeKinds;

namespace {

using Bytes = std::vector<unsigned char>;

// Null where the bytes aren't such a group.
std::unique_ptr<KFS_StreamBase> Load(std::span<unsigned char const> bytes)
{
    CKF_File file;
    if (file.Open(bytes) != 0) return nullptr;
    std::unique_ptr<KFS_StreamBase> root = TreeKinds::MakeRoot();
    return KFSp_Boundary([&] { root->Read(&file, nullptr); }) == 0 ? std::move(root) : nullptr;
}

std::optional<Bytes> Save(KFS_StreamBase const& root)
{
    CKF_File file;
    if (file.CreateInMemory() != 0 || KFSp_Boundary([&] { root.Write(&file); }) != 0 || file.Commit() != 0)
        return std::nullopt;
    return Bytes(file.GetBytes().begin(), file.GetBytes().end());
}

// What `root` gives as a file, and what that gives again. Null where the tree can't be saved.
std::optional<Bytes> SaveTwice(KFS_StreamBase& root)
{
    ForgetNames(root);
    std::optional<Bytes> const first = Save(root);
    if (!first) return std::nullopt;
    std::unique_ptr<KFS_StreamBase> const again = Load(*first);
    if (!again) std::abort();
    return Save(*again);
}

// The second file is the one that stays: a slider's range that rounds to nothing is that of its limits from then on.
void ExpectRoundTrip(KFS_StreamBase& root)
{
    if (std::optional<Bytes> const second = SaveTwice(root)) {
        std::unique_ptr<KFS_StreamBase> const again = Load(*second);
        if (!again || Save(*again) != second) std::abort();
    }
}

template <class Visit>
void ForEachLeaf(KFS_StreamBase& root, Visit visit)
{
    root.GetAsGroup()->ForEachNonCanonicalLeafStream(visit, nullptr);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size)
{
    kfshost::Session const session;  // one a run, so that nothing outlives it
    static Q_ReportSink const stderrSink = Q_SetReportSink([](Q_Report const&) {});
    TreeKinds const kinds;

    std::unique_ptr<KFS_StreamBase> const root = Load({data, size});
    if (!root) return 0;
    ExpectRoundTrip(*root);
    Choices choices({data, size});
    ForEachLeaf(*root, [&](KFS_Stream* leaf) {
        // A layer isn't a number, and can't be asked for as one.
        if (!leaf->IsCustom()) {
            Ask(*leaf);
            EditLeaf(*leaf, choices);
            Ask(*leaf);
        }
    });
    std::unique_ptr<KFS_StreamBase> const clone(root->Clone(true));
    static_cast<void>(Save(*root));
    return 0;
}
