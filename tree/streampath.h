#pragma once

#include "frame/export.h"
#include "frame/services/identifiers.h"
#include "frame/services/strings.h"
#include "tree/streamid.h"

#include <vector>

// The way from a root group down to a stream: the head names a child of the root, the tail the stream itself. The empty
// path means the root. A path holds no pointer, so it outlives the tree and can be saved.
//
// Threads: a plain value.
class KFS_API KFS_StreamIDPath {
public:
    KFS_StreamIDPath() = default;
    explicit KFS_StreamIDPath(KFS_StreamID const& head);
    KFS_StreamIDPath(KFS_StreamID const& head, KFS_StreamID const& second);
    KFS_StreamIDPath(KFS_StreamID const& head, KFS_StreamID const& second, KFS_StreamID const& third);
    // `parent` with `tail` added.
    KFS_StreamIDPath(KFS_StreamIDPath const& parent, KFS_StreamID const& tail);
    KFS_StreamIDPath(KFS_StreamIDPath const&) = default;
    KFS_StreamIDPath(KFS_StreamIDPath&& other) noexcept { components_.swap(other.components_); }
    virtual ~KFS_StreamIDPath();
    KFS_StreamIDPath& operator=(KFS_StreamIDPath const&) = default;
    // Exchanges the two paths.
    KFS_StreamIDPath& operator=(KFS_StreamIDPath&& other) noexcept
    {
        components_.swap(other.components_);
        return *this;
    }
    void CopyPath(KFS_StreamIDPath const& path) { components_ = path.components_; }

    std::vector<KFS_StreamID>& GetPath() { return components_; }
    std::vector<KFS_StreamID> const& GetPathConst() const { return components_; }
    unsigned int GetLength() const { return static_cast<unsigned int>(components_.size()); }
    bool IsEmpty() const { return components_.empty(); }
    // Gives the storage back too.
    void Clear();

    // Where there is no such component, these three report it and throw the int 3.
    KFS_StreamID const& GetComponent(unsigned int position) const;
    KFS_StreamID const& GetHead() const;
    KFS_StreamID const& GetTail() const;

    // What is added may be part of this path.
    void AddHead(KFS_StreamID const& id);
    void AddTail(KFS_StreamID const& id);
    void AddTail(KFS_StreamIDPath const& path);
    // These three need a path that isn't empty; they don't look.
    KFS_StreamID RemoveHead();
    KFS_StreamID RemoveTail();
    KFS_StreamIDPath GetParentPath() const;

    // False on an empty path.
    bool IsEqualToTail(KFS_StreamID const& id) const;
    // Component by component, with the comparisons of KFS_StreamID; a prefix comes before what it is a prefix of.
    friend KFS_API bool operator==(KFS_StreamIDPath const& a, KFS_StreamIDPath const& b);
    friend bool operator!=(KFS_StreamIDPath const& a, KFS_StreamIDPath const& b) { return !(a == b); }
    friend KFS_API bool operator<(KFS_StreamIDPath const& a, KFS_StreamIDPath const& b);
    // Looks at the match names alone; names that aren't set equal one another.
    bool IsEqualByMatchName(KFS_StreamIDPath const& other) const;
    // A strict prefix: no path is a prefix of itself.
    bool IsPrefixOf(KFS_StreamIDPath const& other) const;
    // `where`, which may be null, gets the first component of that name from the head, or 0xFFFFFFFF.
    bool FindFirstInstanceOfMatchName(KFS_MatchName const& name, unsigned int* where) const;
    // Whether the component at `level`, counted from 1 at the head, has that name; false on a shorter path. Level 0 is
    // reported and throws the int 3.
    bool HasTargetParent(KFS_MatchName const& name, unsigned int level) const;

    // The same on every machine and in every version. It covers both fields of each component, so paths that compare
    // equal by index alone may differ in it.
    hearth::utility::Guid MakeUID() const;

    // A path once stored a type number; it no longer does.
    bool StoresStrmType() const { return false; }
    unsigned int GetStrmType() const { return 0xFFFFFFFF; }

    // An object with one entry a component, in order: {"0": {"index": 3, "matchName": "..."}, ...}. An index that isn't
    // there is 4294967295. The keys have equal width, so that they sort in the order of the components. The pool must
    // know each component's text.
    u16str GetAs_JSON() const;
    // Appends what the text holds, in its order. Throws the int of a text that is no such object, with the path as it
    // was.
    void SetFrom_JSON(u16str const& text);

    // A list "kfsp". Both throw the chunk service's code; what a failed Read had read stays in the path. A path of an
    // old file that holds a type number goes to the application's oldPathFixupFunc.
    void Read(CKF_File* file, CKF_ChunkInfo const* parent);
    void Write(CKF_File* file) const;

    // The path that ends a run of paths in a file. Both work between KFS_Birth and KFS_Death only.
    static void WriteSentinel(CKF_File* file);
    bool IsSentinel() const;

    void DebugLog(char const*) const {}

private:
    std::vector<KFS_StreamID> components_;  // head first
};

// `path` down to its last component of that name: the path of the nearest ancestor-or-self with it. Empty if there is
// none.
KFS_API KFS_StreamIDPath KFS_FindFromReverse(KFS_MatchName const& name, KFS_StreamIDPath const& path);
