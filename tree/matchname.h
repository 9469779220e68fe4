#pragma once

#include "frame/export.h"
#include "frame/services/identifiers.h"

#include <string>

struct CKF_ChunkInfo;
struct CKF_File;

// The stable, language-independent name of a kind of stream or of a place in a group, carried as the 16-byte hash of
// its text. Copying, comparing and IsValid touch nothing but those bytes; making a name from a text interns the text in
// a process-wide pool that maps the hash back to it. The pool only grows, exists before KFS_Birth and after KFS_Death,
// and may be used from any thread.
class KFS_API KFS_MatchName {
public:
    // A name that isn't set.
    KFS_MatchName() = default;
    // `text`: NUL-terminated bytes; null counts as the empty text. The flag has no effect. Throws std::bad_alloc.
    KFS_MatchName(unsigned char const* text, bool);
    KFS_MatchName(char const* text, bool);
    KFS_MatchName(std::basic_string<unsigned char> const& text, bool);

    KFS_MatchName(KFS_MatchName const&) = default;
    KFS_MatchName& operator=(KFS_MatchName const&) = default;
    // These two go through a temporary string, so the pointer must not be null.
    KFS_MatchName& operator=(unsigned char const* text);
    KFS_MatchName& operator=(char const* text);

    void SetName(unsigned char const* text);
    void SetName(char const* text);
    void SetName(std::basic_string<unsigned char> const& text);

    // Takes a hash as it is; the pool may not know it.
    void SetGuid(hearth::utility::Guid const& guid) { guid_ = guid; }
    hearth::utility::Guid const& GetGuid() const { return guid_; }

    // The pool's text (at most 39 bytes of it are kept), valid for the life of the process; null if no text made this
    // hash.
    unsigned char const* GetName() const;

    bool IsValid() const { return !(guid_ == hearth::utility::Guid()); }

    // The text as an atom "kfmn" of 40 bytes, padded with NULs; the hash isn't stored. Both throw the chunk service's
    // code.
    //
    // Read interns what it reads, whether or not this process has ever heard of it. Write needs a name whose text the
    // pool knows, or one that isn't set, which is the name of the empty text; it throws the int 3 on any other.
    void Read(CKF_File* file, CKF_ChunkInfo const* parent);
    void Write(CKF_File* file) const;

    // The name that ends a group's children in a file.
    static void WriteEndOfGroupMarker(CKF_File* file);
    bool IsEndOfGroupMarker() const;

    void DebugLog(char const*) const {}

    friend bool operator==(KFS_MatchName const& a, KFS_MatchName const& b) { return a.guid_ == b.guid_; }
    friend bool operator!=(KFS_MatchName const& a, KFS_MatchName const& b) { return !(a.guid_ == b.guid_); }
    // Stable, but not the order of the texts.
    friend bool operator<(KFS_MatchName const& a, KFS_MatchName const& b) { return a.guid_ < b.guid_; }

private:
    hearth::utility::Guid guid_;
};
