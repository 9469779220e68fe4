// One leaf of a project file: read, saved, read again and saved again, which must give the same bytes; then asked at some times, and edited.
// Whatever the bytes are, an error is an answer, and a crash, a leak or a hang isn't.

#include "frame/boundary_private.h"
#include "frame/services/chunkfile.h"
#include "host/session.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"

#include <cstdint>
#include <cstdlib>
#include <optional>
#include <vector>

namespace {

std::unique_ptr<KFS_Stream> MakeStream()
{
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    return std::make_unique<KFS_Stream>(1, 600, 0, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
}

// Null where the bytes aren't a leaf.
std::unique_ptr<KFS_Stream> Load(std::span<unsigned char const> bytes)
{
    CKF_File file;
    if (file.Open(bytes) != 0) return nullptr;
    std::unique_ptr<KFS_Stream> stream = MakeStream();
    return KFSp_Boundary([&] { stream->Read(&file, nullptr); }) == 0 ? std::move(stream) : nullptr;
}

std::optional<std::vector<unsigned char>> Save(KFS_Stream const& stream)
{
    CKF_File file;
    if (file.CreateInMemory() != 0 || KFSp_Boundary([&] { stream.Write(&file); }) != 0 || file.Commit() != 0)
        return std::nullopt;
    std::span<unsigned char const> const bytes = file.GetBytes();
    return std::vector<unsigned char>(bytes.begin(), bytes.end());
}

void Ask(KFS_Stream const& stream)
{
    std::vector<double> value(static_cast<std::size_t>(stream.GetDimension()) + 1);
    unsigned int const scale = stream.GetTimeScale();
    for (int const time : {-1000, 0, 1, 17, 300, 601, 100000}) {
        T_Time const at{time, scale};
        static_cast<void>(KFS_GetValueFPlus(&stream, &at, 0, value.data(), nullptr, nullptr));
    }
}

void Edit(KFS_Stream& stream)
{
    std::vector<double> const value(static_cast<std::size_t>(stream.GetDimension()) + 1, 0.5);
    T_Time const at{150, stream.GetTimeScale()};
    static_cast<void>(KFS_InsertKeyF(&stream, &at, 1, value.data(), KFS_Interp_Spline, KFS_Interp_Linear));
    T_Time const between{151, stream.GetTimeScale()};
    static_cast<void>(KFS_InsertKeyF(&stream, &between, 1, nullptr, KFS_Interp_None, KFS_Interp_None));
    static_cast<void>(KFS_RemoveKey(&stream, 0, nullptr));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size)
{
    kfshost::Session const session;  // one a run, so that nothing outlives it
    static Q_ReportSink const stderrSink = Q_SetReportSink([](Q_Report const&) {});

    std::unique_ptr<KFS_Stream> const stream = Load({data, size});
    if (!stream) return 0;
    // What a stream remembers until it takes a name would be in the first of two saves only.
    stream->SetNamesSameInitted(false);
    if (std::optional<std::vector<unsigned char>> const first = Save(*stream)) {
        std::unique_ptr<KFS_Stream> const again = Load(*first);
        if (!again || Save(*again) != first) std::abort();
    }
    // A client's values can't be asked for without the client's functions.
    if (!stream->IsCustom()) {
        Ask(*stream);
        Edit(*stream);
        Ask(*stream);
    }
    return 0;
}
