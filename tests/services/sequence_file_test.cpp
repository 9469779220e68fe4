#include "tests/services/chunkbytes.h"

#include "frame/services/memory.h"
#include "frame/services/sequence.h"

namespace {

SEQ_Head** MakeList(int itemSize, int count)
{
    SEQ_Head** list = nullptr;
    EXPECT_EQ(0, SEQ_New(0, static_cast<short>(itemSize), 4, 1, &list));
    for (int i = 0; i < count; ++i) {
        std::string const item(static_cast<std::size_t>(itemSize), static_cast<char>('a' + i % 26));
        EXPECT_EQ(0, SEQ_Insert(item.data(), -1, list));
    }
    return list;
}

std::string Items(SEQ_Head const* const* list)
{
    std::string bytes;
    for (int i = 0; i < (*list)->count; ++i) {
        std::string item(static_cast<std::size_t>((*list)->itemSize), '\0');
        EXPECT_EQ(0, SEQ_GetItemCopy(list, 0, i, item.data()));
        bytes += item;
    }
    return bytes;
}

TEST(SequenceFile, OnlyTheItemsGoIntoTheChunkAndComeBack)
{
    for (int const itemSize : {1, 3, 7, 8, 12, 16, 104, 32767})
        for (int const count : {0, 1, 2, 27}) {
            SCOPED_TRACE(testing::Message() << count << " items of " << itemSize);
            SEQ_Head** const list = MakeList(itemSize, count);
            CKF_File file;
            ASSERT_EQ(0, file.CreateInMemory());
            ASSERT_EQ(0, SEQ_Write(list, &file));
            ASSERT_EQ(0, file.Commit());
            EXPECT_EQ(Form(Atom("seql", Long(static_cast<std::uint32_t>(itemSize)) +
                                            Long(static_cast<std::uint32_t>(count)) + Items(list))),
                      Bytes(file));

            CKF_File read;
            ASSERT_EQ(0, read.Open(file.GetBytes()));
            SEQ_Head** back = nullptr;
            ASSERT_EQ(0, SEQ_Read(&read, &back));
            EXPECT_EQ(itemSize, (*back)->itemSize);
            EXPECT_EQ(count, (*back)->count);
            EXPECT_EQ(Items(list), Items(back));
            EXPECT_EQ(nullptr, (*back)->refcon);
            EXPECT_EQ(0, SEQ_GetPinCount(back));
            SEQ_Dispose(list, 0);
            SEQ_Dispose(back, 0);
        }
}

TEST(SequenceFile, StepsOverOtherChunksAndStaysInItsList)
{
    const std::string seql = Atom("seql", Long(2) + Long(1) + "ab");
    std::string const bytes =
        Form(List("kfbs", Atom("what", "x") + seql + Atom("next", "n")) + List("kfbs", Atom("what", "x")) + seql);
    CKF_File file;
    ASSERT_EQ(0, file.Open(Span(bytes)));
    SEQ_Head** list = nullptr;
    {
        const CKF_ScDescendList leaf(&file, CKF_Id("kfbs"), nullptr, nullptr);
        ASSERT_EQ(0, SEQ_Read(&file, &list));
        EXPECT_EQ("ab", Items(list));
        SEQ_Dispose(list, 0);
        EXPECT_EQ(0, CKF_ReadAtom(&file, CKF_Id("next"), leaf.GetChunkInfo(), 0, nullptr));
    }
    const CKF_ScDescendList leaf(&file, CKF_Id("kfbs"), nullptr, nullptr);
    list = nullptr;
    EXPECT_EQ(CKF_Err_NoSuchChunk, SEQ_Read(&file, &list));
    EXPECT_EQ(nullptr, list);
}

TEST(SequenceFile, OutOfMemoryLeavesNothing)
{
    const std::string bytes = Form(Atom("seql", Long(3) + Long(2) + "abcdef"));
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (int n = 1;; ++n) {
        ASSERT_LT(n, 100);
        CKF_File file;
        ASSERT_EQ(0, file.Open(Span(bytes)));
        SEQ_Head** list = nullptr;
        Q_FailAllocation(n);
        int const code = SEQ_Read(&file, &list);
        bool const fired = Q_FailAllocationFired();
        Q_FailAllocation(0);
        if (!fired) {
            EXPECT_EQ(0, code);
            SEQ_Dispose(list, 0);
            break;
        }
        EXPECT_EQ(Q_Err_OutOfMemory, code);
        EXPECT_EQ(nullptr, list);
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

}  // namespace
