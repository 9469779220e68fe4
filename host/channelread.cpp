// Reading a leaf of a scene, which has to be made in the form that the file has before it reads itself. The file is looked at
// as bytes, since a reader of chunks only goes forward.

#include "frame/services/chunkfile.h"
#include "host/channelstream.h"
#include "host/kinds.h"

#include <algorithm>
#include <optional>
#include <span>

namespace kfshost {

namespace {

using Bytes = std::span<unsigned char const>;

constexpr int LeafListType = CKF_Id("kfbs");
constexpr int RecordId = CKF_Id("kfb4");
constexpr int RangeId = CKF_Id("kfum");

unsigned int Number(Bytes bytes, std::size_t offset, std::size_t size)
{
    unsigned int number = 0;
    for (std::size_t i = offset; i < offset + size; ++i) number = number << 8 | (i < bytes.size() ? bytes[i] : 0U);
    return number;
}

// The first atom with an id among the chunks of a list.
std::optional<Bytes> FindAtom(Bytes list, int id)
{
    constexpr std::size_t head = 8;
    while (list.size() >= head) {
        Bytes const rest = list.subspan(head);
        std::size_t const size = Number(list, 4, 4);
        if (size > rest.size()) break;
        if (Number(list, 0, 4) == static_cast<unsigned int>(id)) return rest.first(size);
        list = rest.subspan(std::min(rest.size(), size + size % 2));
    }
    return std::nullopt;
}

// What the head of a leaf says of its form (docs/file-format.md).
struct LeafForm {
    explicit LeafForm(Bytes list) : hasRange(FindAtom(list, RangeId).has_value())
    {
        Bytes const record = FindAtom(list, RecordId).value_or(Bytes());
        dimension = static_cast<short>(Number(record, 2, 2));
        isPath = (Number(record, 4, 2) & KFS_StreamFlag_Spatial) != 0;
        spatialMask = static_cast<unsigned short>(Number(record, 8, 2));
        isCustom = Number(record, 56, 2) != 0;
    }

    bool IsChannels() const { return !isCustom && dimension >= 1 && (!isPath || (dimension >= 2 && dimension <= 3)); }

    bool hasRange;
    short dimension;
    bool isPath;
    unsigned short spatialMask;
    bool isCustom;
};

std::unique_ptr<KFS_Stream> MakeLeaf(StreamKind kind, LeafForm const& form, KFS_StreamFactory* factory)
{
    constexpr unsigned int scale = 600;  // it takes the file's
    if (!form.IsChannels()) {            // loaded as what it is, and then refused with a sentence
        KFS_ValueDesc description;
        description.dataType = KFS_Type_Double;
        return std::make_unique<KFS_Stream>(1, scale, true, false, KFS_InterpMask_All, 0, description,
                                            &MatchNameOf(kind), factory, false);
    }
    auto leaf = std::make_unique<ChannelStream>(
        kind, form.dimension, scale, form.isPath ? StreamForm::Path : StreamForm::Curves, true, factory, false);
    leaf->SetSpInterpMask(form.spatialMask);
    // Which says that the file has no range. The flag isn't one of files.
    if (!form.hasRange) leaf->SetStreamBaseFlags(KFS_BaseFlag_Reserved8, KFS_BaseFlag_Reserved8);
    return leaf;
}

}  // namespace

void NodeGroup::ReadAndStore(KFS_MatchName const& name, CKF_File* file, CKF_ChunkInfo const* chunk)
{
    auto const kind = std::ranges::find_if(AllStreamKinds, [&](StreamKind one) { return MatchNameOf(one) == name; });
    if (kind == std::end(AllStreamKinds)) {
        KFS_NamedStreamGroup::ReadAndStore(name, file, chunk);
        return;
    }
    CKF_ScDescend const list(file, CKF_ListId, LeafListType, nullptr, nullptr);
    CKF_ChunkInfo const& info = *list.GetChunkInfo();
    LeafForm const form(file->GetBytes().subspan(info.offset, info.size));
    Q_ScAutoPtr<KFS_StreamBase> stream(MakeLeaf(*kind, form, GetFactory()).release());
    KFS_StreamBase* const child = stream.get();
    // In its place before it reads, since what it takes from the file depends on its parent.
    std::unique_ptr<KFS_StreamBase> const old(SwapStream(&stream));
    if (GetStream(name, false) != child) return;  // a listener has taken it
    child->Read(file, &info);
    child->SetStreamBaseFlags(0, KFS_BaseFlag_Reserved8);
}

}  // namespace kfshost
