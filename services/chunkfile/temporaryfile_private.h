// The file in which a save takes place, beside its target.
#pragma once

#include <string>

#include <sys/types.h>

// Where a path leads when all symbolic links at its end are followed, also to what isn't there. 0 or an errno value.
[[nodiscard]] int CKFp_FollowLinks(std::string* path);
// The folder of a path.
std::string CKFp_FolderOf(std::string const& path);

// Answers are 0 or an errno value.
class CKFp_TemporaryFile {
public:
    CKFp_TemporaryFile() = default;
    // Removes what took no target's place.
    ~CKFp_TemporaryFile();
    CKFp_TemporaryFile(CKFp_TemporaryFile const&) = delete;
    CKFp_TemporaryFile& operator=(CKFp_TemporaryFile const&) = delete;

    // Makes an empty file of a name that no other has. Removes first what dead processes left of this target.
    [[nodiscard]] int Create(std::string const& target, mode_t mode);
    int Descriptor() const noexcept { return descriptor_; }
    // Tells what the system had to say at last. The lock stays.
    [[nodiscard]] int Close() noexcept;
    [[nodiscard]] int Rename(std::string const& target) noexcept;

private:
    [[nodiscard]] int TryName(std::string const& name, mode_t mode);
    void DropName() noexcept;

    char* name_ = nullptr;     // allocated; null where there is nothing to remove
    bool remembered_ = false;  // signal handlers may know it
    int descriptor_ = -1;
    int lock_ = -1;  // the same file: as long as it is open, the file is known to be somebody's
};
