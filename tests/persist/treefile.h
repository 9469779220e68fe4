#pragma once

#include "tests/persist/leaffile.h"
#include "tests/support/groups.h"

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

// Trees in files, made by hand and taken apart.

inline std::string MatchName(std::string name)
{
    name.resize(40);
    return Atom("kfmn", name);
}
inline std::string const End = MatchName("ZQVM Group End");
inline std::string const Marker = "-_0_/-";

inline std::string BaseNamed(std::string const& name, unsigned flags = KFS_BaseFlag_Active)
{
    return Atom("kfsb", Long(flags)) + Atom("kfsn", name);
}

inline std::string Group(std::string const& name, std::string const& children)
{
    return List("kfgp", BaseNamed(name) + children + End);
}

inline std::string OneLeaf(std::string const& name, double value, int dimension = 1)
{
    std::vector<double> numbers(static_cast<std::size_t>(dimension) * 5, 0.0);
    std::fill_n(numbers.begin(), dimension, value);
    return List("kfbs",
                BaseNamed(name) + Atom("kfb4", LeafRecord().Dimension(dimension)) + Atom("cdat", Doubles(numbers)));
}

// The match names in a file, indented by how deep they stand, a group's end left out.
inline std::vector<std::string> NamesIn(MemoryFile const& file)
{
    std::vector<std::string> names;
    CKF_ChunkWalk walk(file.Bytes());
    CKF_RawChunk chunk;
    while (walk.Next(&chunk)) {
        if (Long(static_cast<std::uint32_t>(chunk.id)) == "kfmn") {
            EXPECT_EQ(40u, chunk.data.size());
            std::string const name = reinterpret_cast<char const*>(chunk.data.data());
            if (name != "ZQVM Group End")
                names.push_back(std::string(static_cast<std::size_t>(chunk.depth - 2), ' ') + name);
        }
    }
    return names;
}

inline MemoryFile WrittenGroup(KFS_StreamGroup const* group, int major = 95)
{
    return MemoryFile([=](CKF_File* file) {
        file->SetVersion(major, 0);
        EXPECT_EQ(0, Thrown([&] { group->Write(file); }));
    });
}

inline int ReadGroup(KFS_StreamGroup* group, std::string const& file)
{
    CKF_File open;
    EXPECT_EQ(0, open.Open(Span(file))) << open.LastErrorText();
    return Thrown([&] { group->Read(&open, nullptr); });
}
inline int ReadGroup(KFS_StreamGroup* group, MemoryFile const& file)
{
    return ReadGroup(group, std::string(file.Bytes().begin(), file.Bytes().end()));
}

inline double ValueOf(KFS_StreamBase const* stream)
{
    return dynamic_cast<TestLeaf const*>(stream)->ValueAt(0);
}

inline void SetValue(KFS_StreamBase* stream, double value)
{
    KFS_Stream* const leaf = stream->GetAsLeaf();
    std::vector<double> const values(static_cast<std::size_t>(leaf->GetDimension()), value);
    T_Time const at{0, leaf->GetTimeScale()};
    EXPECT_EQ(0, KFS_InsertKeyF(leaf, &at, 1, values.data(), 0, 0));
}

class Tree : public SceneTest {
protected:
    static std::unique_ptr<KFS_IndexedStreamGroup> MakeLayers()
    {
        return std::unique_ptr<KFS_IndexedStreamGroup>(TestKinds::Make("layers").release()->GetAsIndexedGroup());
    }
    static KFS_StreamBase* Append(KFS_IndexedStreamGroup* group, char const* kind)
    {
        Q_ScAutoPtr<KFS_StreamBase> stream = TestKinds::Make(kind);
        KFS_StreamBase* const child = stream.get();
        group->AppendStream(&stream);
        return child;
    }
};
