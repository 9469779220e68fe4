#include "tree/streamgroup.h"

#include "tests/persist/treefile.h"

#include <random>

// Trees whose save or load goes wrong: what they leave is whole, and nothing of them stays behind.

namespace {

TEST_F(Tree, EveryWriteMayFail)
{
    auto const layers = MakeLayers();
    SetValue(static_cast<KFS_NamedStreamGroup*>(Append(layers.get(), "node"))->GetEditableStream(Name("opacity")), 1.0);
    for (int n = 1;; ++n) {
        FailNthAppend hook(n);
        CKF_File file;
        static_cast<void>(file.CreateInMemory(&hook));  // fails for the first few
        int const code = Thrown([&] { layers->Write(&file); });
        if (!hook.Fired()) {
            EXPECT_EQ(0, code);
            EXPECT_LT(20, n);
            break;
        }
        EXPECT_NE(0, code) << n;
        EXPECT_NE(0, file.Commit()) << n;
    }
}

// A file that ends early, although every list in it ends where its content does.
std::string CutAt(MemoryFile const& file, std::size_t size)
{
    std::string bytes(file.Bytes().begin(), file.Bytes().begin() + static_cast<std::ptrdiff_t>(size));
    CKF_ChunkWalk walk(file.Bytes());
    CKF_RawChunk chunk;
    while (walk.Next(&chunk)) {
        if (chunk.listType != 0 && chunk.offset + 12 <= size) {
            auto const left = static_cast<std::uint32_t>(size - chunk.offset - 8);
            bytes.replace(chunk.offset + 4, 4, Long(std::min(left, chunk.claimedSize + 4)));
        }
    }
    return bytes;
}

TEST_F(Tree, BrokenFilesLeaveAWholeTree)
{
    auto const layers = MakeLayers();
    auto* const node = static_cast<KFS_NamedStreamGroup*>(Append(layers.get(), "node"));
    SetValue(node->GetEditableStream(Name("opacity")), 1.0);
    SetValue(Append(layers.get(), "opacity"), 2.0);
    MemoryFile const whole = WrittenGroup(layers.get());
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    unsigned int mostChildren = 0;
    for (std::size_t size = 34; size < whole.Bytes().size(); size += 2) {
        SCOPED_TRACE(size);
        {
            auto const other = MakeLayers();
            EXPECT_NE(0, ReadGroup(other.get(), CutAt(whole, size)));
            WrittenGroup(other.get());
            mostChildren = std::max(mostChildren, other->GetNumStreams());
        }
        ASSERT_EQ(before, Q_MemoryLive(nullptr));
    }
    EXPECT_EQ(2u, mostChildren) << "some end behind all children";
}

TEST_F(Tree, EveryAllocationOfAReadMayFail)
{
    auto const layers = MakeLayers();
    auto* const node = static_cast<KFS_NamedStreamGroup*>(Append(layers.get(), "node"));
    SetValue(node->GetEditableStream(Name("opacity")), 1.0);
    Append(layers.get(), "opacity")->SetDisplayName(Text("a name that is longer than a short string holds"));
    MemoryFile const whole = WrittenGroup(layers.get());
    MakeNode();  // fills in what canonical groups keep
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    int const failures = FailEveryAllocation([] { return MakeLayers(); },
                                             [&](KFS_IndexedStreamGroup& group) {
                                                 CKF_File file;
                                                 KFSp_ThrowIf(file.Open(whole.Bytes()));
                                                 try {
                                                     return Thrown([&] { group.Read(&file, nullptr); });
                                                 } catch (std::exception const& exception) {
                                                     ADD_FAILURE() << "not a code: " << exception.what();
                                                     return 4;
                                                 }
                                             },
                                             [&](KFS_IndexedStreamGroup& group, int, Q_MemoryCount const&) {
                                                 static_cast<void>(reports.Take());
                                                 WrittenGroup(&group);
                                             });
    EXPECT_LT(10, failures);
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

// Whatever stands in a file, reading it gives a tree that can be written, and nothing is left of it afterwards.
TEST_F(Tree, FilesThatNobodyWrote)
{
    auto const layers = MakeLayers();
    auto* const node = static_cast<KFS_NamedStreamGroup*>(Append(layers.get(), "node"));
    SetValue(node->GetEditableStream(Name("opacity")), 1.0);
    SetValue(Append(Append(layers.get(), "layers")->GetAsIndexedGroup(), "opacity"), 2.0);
    std::vector<unsigned char> const whole = WrittenGroup(layers.get()).Bytes();
    std::mt19937 random(5);
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (int round = 0; round < 1500; ++round) {
        std::vector<unsigned char> bytes = whole;
        for (int i = 0; i < 1 + round % 6; ++i) {
            bytes[32 + random() % (bytes.size() - 32)] =
                static_cast<unsigned char>(random() % 3 == 0 ? random() : random() % 4);
        }
        auto const other = MakeLayers();
        CKF_File file;
        if (file.Open(bytes) == 0 && Thrown([&] { other->Read(&file, nullptr); }) == 0) WrittenGroup(other.get());
        static_cast<void>(reports.Take());
    }
    // Names that files bring are kept for good, texts of reports too.
    EXPECT_LT(Q_MemoryLive(nullptr).bytes - before.bytes, 1 << 20);
}

TEST_F(Tree, GroupsInGroupsHaveAnEnd)
{
    auto const nested = [](int depth) {
        std::string file = Group(Marker, "");
        for (int i = 1; i < depth; ++i) file = Group(Marker, MatchName("layers") + file);
        return Form(file);
    };
    EXPECT_EQ(0, ReadGroup(MakeLayers().get(), nested(CKF_MaxDepth / 2)));
    EXPECT_EQ(CKF_Err_TooDeep, ReadGroup(MakeLayers().get(), nested(2 * CKF_MaxDepth)));
}

}  // namespace
