#include "frame/report_private.h"

#include "tests/support/streams.h"

#include <cstring>
#include <tuple>

namespace {

class Reports : public StreamTest {};

TEST_F(Reports, EveryCodeHasItsSentence)
{
    std::tuple<int, short, char const*> const sentences[] = {
        {2, 4, "attempt to get a value from an internally damaged time stream."},
        {7425, 7, "attempt to overwrite an already existing time stream key value."},
        {7426, 13, "attempt to get a key value from a constant time stream."},
        {7427, 14, "attempt to inquire about a key value in a time stream with no key values."},
        {7428, 19, "invalid time scale in time conversion."},
        {7429, 20, "addition caused time value overflow."},
        {7430, 5,
         "attempt to insert a key value into a time stream at a time position not representable in the stream time "
         "scale."},
        {7431, -3, "interpolation method not allowed for this stream (-3)."},
        {7432, 46, "invalid time stream information in file (header length)."},
        {7433, 33, "unknown error (7433)."},
        {7434, 55, "attempt to inquire spatial tangents from a non-spatial stream."},
        {7439, 0, "unknown error (7439)."},
        {7440, 0, "only 2d spatial streams allow arc-length interpolation"},
        {7441, 0, "unknown error (7441)."},
        {7442, 0, "unknown error (7442)."},
        {7443, 0, "only 2d or 3d spatial streams are allowed for this operation."},
        {7444, 0, "unknown error (7444)."},
        {7445, 0, "custom streams are not allowed for this operation."},
        {9999, 12, "unknown error (9999)."},
        {-1, 12, "unknown error (-1)."},
    };
    for (auto const& [code, argument, text] : sentences) {
        SCOPED_TRACE(code);
        EXPECT_EQ(code, KFSp_ReportErr(36, code, argument));
        EXPECT_REPORT(reports, 36, text);
    }
    EXPECT_EQ(0, KFSp_ReportErr(36, 0, 4));
    EXPECT_NO_REPORT(reports);
}

// Only sentences that are formatted clear the thread's last error, and only the low half of the operation goes into the
// id.
TEST_F(Reports, LastErrorAndIdFollowTheKindOfSentence)
{
    Qp_SetThreadLastError(77);
    EXPECT_EQ(KFS_Err_Only2D3D, KFSp_ReportErr(45, KFS_Err_Only2D3D, 0));
    EXPECT_EQ(77, Qp_GetThreadLastError());
    EXPECT_EQ(KFS_Err_NoKeys, KFSp_ReportErr(0x70024, KFS_Err_NoKeys, 4));
    EXPECT_EQ(0, Qp_GetThreadLastError());
    std::vector<Reported> const seen = reports.Take();
    ASSERT_EQ(2u, seen.size());
    EXPECT_EQ(0x1D002D, seen[0].id);
    EXPECT_EQ(0x1D0024, seen[1].id);
}

// The texts and their order are what translators and readers of reports hold on to: one hundred rows, each with its own
// number.
TEST_F(Reports, TableHoldsOneHundredNumberedRowsAndACloser)
{
    Q_ZTable const& table = **KFS_G_zref;
    EXPECT_STREQ("KFS", table.module);
    ASSERT_EQ(101, table.rowCount);
    for (int i = 0; i < 100; ++i) {
        char key[32];
        std::snprintf(key, sizeof key, "$$$/VX/KFS/LStr/%04d=", i);
        EXPECT_EQ(0, std::strncmp(key, table.rows[i].entry, std::strlen(key))) << i;
        EXPECT_STREQ(table.rows[i].entry + std::strlen(key), KFSp_MessageText(i));
    }
    EXPECT_EQ(nullptr, table.rows[100].entry);
    EXPECT_STREQ("blue", KFSp_MessageText(99));
}

}  // namespace
