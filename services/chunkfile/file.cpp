#include "services/chunkfile/file_private.h"

namespace {

int StartReading(CKF_File& file, CKF_File::Impl& impl, CKFp_Bytes bytes)
{
    impl.reader = std::make_unique<CKFp_Reader>(bytes, impl.failure);
    CKFp_Version version;
    if (int const code = impl.reader->Start(&version)) return code;
    file.majorVersion = version.major;
    file.minorVersion = version.minor;
    file.textEncoding.code = version.encoding;
    return 0;
}

int StartWriting(CKF_File::Impl& impl, std::unique_ptr<CKFp_Sink> sink, std::uint32_t maxSize)
{
    impl.writer = std::make_unique<CKFp_Writer>(std::move(sink), maxSize, impl.failure);
    return impl.writer->Start();
}

// Begins afresh. A file that can't be opened or created holds no resources, but its failure.
template <class Work>
int Begin(CKF_File& file, CKF_File::Impl& impl, Work work)
{
    file.Close();
    impl.failure = {};
    int code = 0;
    try {
        code = work();
    } catch (std::bad_alloc const&) {
        code = impl.failure.SetOutOfMemory(0);
    }
    if (code != 0) file.Close();
    return code;
}

}  // namespace

CKF_File::CKF_File() : impl_(std::make_unique<Impl>()), maxSize_(UINT32_MAX) {}

CKF_File::~CKF_File() = default;

int CKF_File::Open(char const* path)
{
    return Begin(
        *this, *impl_,
        [&] {
            if (!path) return impl_->failure.Set(CKF_Err_BadArgument, 0, "no path");
            std::size_t size = 0;
            if (int const code = CKFp_LoadFile(path, impl_->failure, &impl_->loaded, &size)) return code;
            return StartReading(*this, *impl_, {impl_->loaded.get(), size});
        });
}

int CKF_File::Open(std::span<unsigned char const> bytes)
{
    return Begin(
        *this, *impl_, [&] { return StartReading(*this, *impl_, bytes); });
}

int CKF_File::Create(char const* path, CKF_IoHook* hook)
{
    return Begin(
        *this, *impl_,
        [&] {
            if (!path) return impl_->failure.Set(CKF_Err_BadArgument, 0, "no path");
            auto sink = std::make_unique<CKFp_DiskSink>(hook, impl_->failure);
            if (int const code = sink->Create(path)) return code;
            return StartWriting(*impl_, std::move(sink), maxSize_);
        });
}

int CKF_File::CreateInMemory(CKF_IoHook* hook)
{
    return Begin(
        *this, *impl_,
        [&] {
            auto sink = std::make_unique<CKFp_MemorySink>(hook, impl_->failure, impl_->committed);
            return StartWriting(*impl_, std::move(sink), maxSize_);
        });
}

int CKF_File::Commit()
{
    int const code = CKFp_WithWriter(this, [&](CKFp_Writer& writer) {
        return writer.Commit({majorVersion, minorVersion, textEncoding.code});
    });
    impl_->writer.reset();
    return code;
}

void CKF_File::Close() noexcept
{
    impl_->writer.reset();
    impl_->reader.reset();
    impl_->loaded.reset();
    impl_->committed = {};
}

std::span<unsigned char const> CKF_File::GetBytes() const noexcept
{
    if (impl_->reader) return impl_->reader->Bytes();
    return impl_->committed.Bytes();
}

void CKF_File::SetVersion(int major, int minor) noexcept
{
    majorVersion = major;
    minorVersion = minor;
}

bool CKF_File::GetShouldWriteModificationTimes() const noexcept
{
    return writesModificationTimes_;
}

void CKF_File::SetShouldWriteModificationTimes(bool wanted) noexcept
{
    writesModificationTimes_ = wanted;
}

void CKF_File::SetMaxSize(std::uint32_t bytes) noexcept
{
    maxSize_ = bytes;
}

int CKF_File::LastError() const noexcept
{
    return impl_->failure.Code();
}

char const* CKF_File::LastErrorText() const noexcept
{
    return impl_->failure.Text();
}

std::uint64_t CKF_File::LastErrorOffset() const noexcept
{
    return impl_->failure.Offset();
}
