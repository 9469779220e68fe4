#include "keystore/items.h"

#include "frame/boundary_private.h"
#include "keystore/attributes.h"
#include "keystore/edit_private.h"
#include "keystore/items_private.h"
#include "tests/support/ownedvalues.h"
#include "tests/support/streams.h"

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstdint>
#include <limits>
#include <tuple>

namespace {

class Items : public StreamTest {};

// Element bits that a number becomes, and the number that those bits give back.
struct Conversion {
    signed char type;
    double number;
    std::uint64_t bits;
    double back;
};

constexpr double Infinity = std::numeric_limits<double>::infinity();

Conversion const Conversions[] = {
    {KFS_Type_S8, -1.0, 0xFF, -1.0},
    {KFS_Type_S8, 200.0, 200, -56.0},  // wraps
    {KFS_Type_U8, 300.0, 44, 44.0},    // wraps
    {KFS_Type_U8, -1.0, 255, 255.0},
    {KFS_Type_U8, 2.4, 2, 2.0},
    {KFS_Type_U8, 2.6, 3, 3.0},
    {KFS_Type_S16, -32769.0, 0x7FFF, 32767.0},
    {KFS_Type_U16, 65537.0, 1, 1.0},
    {KFS_Type_S32, -2147483648.0, 0x80000000U, -2147483648.0},
    {KFS_Type_S32, 2147483648.0, 0x80000000U, -2147483648.0},
    {KFS_Type_U32, 4294967295.0, 0xFFFFFFFFU, 4294967295.0},
    {KFS_Type_U32, 4294967297.0, 1, 1.0},
    {KFS_Type_Fixed, 1.5, 98304, 1.5},
    {KFS_Type_Fixed, -1.5, 0xFFFE8000U, -1.5},
    {KFS_Type_Fixed, 0.0, 0, 0.0},
    {KFS_Type_Fixed, -0.0, 0, 0.0},
    {KFS_Type_Fixed, 0.5 / 65536, 1, 1.0 / 65536},  // a half goes away from zero
    {KFS_Type_Fixed, -0.5 / 65536, 0xFFFFFFFFU, -1.0 / 65536},
    {KFS_Type_Fixed, 0.49 / 65536, 0, 0.0},
    {KFS_Type_Fixed, 32768.0, 0x80000000U, -32768.0},  // wraps
    {KFS_Type_Fixed, std::nan(""), 0, 0.0},
    {KFS_Type_UFixed, 40000.25, 2621456384U, 40000.25},
    {KFS_Type_UFixed, -1.0, 0xFFFF0000U, 65535.0},
    {KFS_Type_UFixed, 65537.0, 65536, 1.0},
    {KFS_Type_UFixed, Infinity, 0xFFFFFFFFU, 4294967295.0 / 65536},
    {KFS_Type_UFixed, -Infinity, 0, 0.0},
    {KFS_Type_Float, 0.1, 0x3DCCCCCDU, static_cast<double>(0.1F)},
    {KFS_Type_Double, 0.1, 0x3FB999999999999AU, 0.1},
};
constexpr std::size_t Sizes[] = {1, 1, 2, 2, 4, 4, 4, 4, 4, 8};

TEST_F(Items, ConversionTakesTheNearestElementAndNeverClamps)
{
    using Bytes = std::array<unsigned char, 20>;
    for (Conversion const& row : Conversions) {
        SCOPED_TRACE(testing::Message() << "type " << int(row.type) << " of " << row.number);
        std::size_t const size = Sizes[static_cast<std::size_t>(row.type)];
        TestStream const stream({.dimension = 2, .type = row.type});
        double const numbers[2] = {row.number, row.number};
        // At an odd address: a caller's elements lie where they lie.
        Bytes bytes;
        bytes.fill(0xAA);
        Bytes exported = bytes, expected = bytes;
        ASSERT_EQ(0, KFSp_ConvertItemFromFloat(stream, 0, KFS_Item_KeyValue, numbers, bytes.data() + 1));
        std::memcpy(expected.data() + 1, &row.bits, size);
        std::memcpy(expected.data() + 1 + size, &row.bits, size);
        EXPECT_EQ(expected, bytes);
        EXPECT_EQ(0, KFS_ConvertItemFromFloat(2, static_cast<char>(row.type), numbers, exported.data() + 1));
        EXPECT_EQ(expected, exported) << "both doors convert alike";
        double inPlace[2] = {row.number, row.number};  // where the doubles shrink under the conversion
        EXPECT_EQ(0, KFS_ConvertItemFromFloat(2, static_cast<char>(row.type), inPlace, inPlace));
        EXPECT_EQ(0, std::memcmp(inPlace, expected.data() + 1, 2 * size));
        std::array<double, 3> back{7.0, 7.0, 7.0};
        ASSERT_EQ(0, KFSp_ConvertItemToFloat(stream, 0, KFS_Item_KeyValue, bytes.data() + 1, back.data()));
        EXPECT_EQ((std::array{row.back, row.back, 7.0}), back);
    }
}

TEST_F(Items, TheKindSaysHowManyElementsMove)
{
    struct Row {
        short kind;
        int plain, spatial, passingForPlain;
    } const rows[] = {{KFS_Item_CacheWhole, 10, 6, 2}, {KFS_Item_CacheValue, 2, 2, 2}, {KFS_Item_KeyWhole, 10, 6, 2},
                      {KFS_Item_KeyValue, 2, 2, 2},    {KFS_Item_Component, 1, 1, 1},  {77, 0, 0, 0}};
    TestStream const plain({.dimension = 2});
    TestStream const spatial({.dimension = 2, .spatial = true});
    TestStream custom({.dimension = 2});
    custom->MarkTemporarilyNonCustom(true);
    KFS_CopyItemFunc const functions[] = {KFSp_ConvertItemToFloat, KFSp_ConvertItemFromFloat, KFSp_FakeCopyItemFunc,
                                          KFSp_FakeCopyItemFuncNoLimits};
    for (Row const& row : rows) {
        for (KFS_CopyItemFunc const function : functions) {
            double const from[12] = {1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12};
            auto const moved = [&](KFS_Stream const* stream) {
                double to[12] = {};
                EXPECT_EQ(0, function(stream, 0, row.kind, from, to));
                auto const end = std::mismatch(from, from + 12, to).first;
                EXPECT_EQ(12, (end - from) + std::count(to, to + 12, 0.0));
                return end - from;
            };
            EXPECT_EQ(row.plain, moved(plain)) << "kind " << row.kind;
            EXPECT_EQ(row.spatial, moved(spatial)) << "kind " << row.kind;
            EXPECT_EQ(row.passingForPlain, moved(custom)) << "kind " << row.kind;
        }
    }
    custom->MarkTemporarilyNonCustom(false);
}

TEST_F(Items, CustomValuesAreMovedWholeAndNeverConverted)
{
    OwnedValues::Reset();
    auto const stream = OwnedValues::MakeStream(false);
    using Bytes = std::array<unsigned char, 8>;
    Bytes const from{1, 2, 3, 4, 5, 6, 7, 8};
    for (short const kind : {0, 1, 2, 3, 4}) {
        Bytes to{};
        EXPECT_EQ(0, KFSp_FakeCopyItemFunc(stream.get(), 0, kind, from.data(), to.data()));
        EXPECT_EQ(7441, KFSp_ConvertItemToFloat(stream.get(), 0, kind, from.data(), to.data()));
        EXPECT_REPORT(reports, 81, "can#{rsquo}t convert to custom value");
        EXPECT_EQ(7441, KFSp_ConvertItemFromFloat(stream.get(), 0, kind, from.data(), to.data()));
        EXPECT_REPORT(reports, 80, "can#{rsquo}t convert from custom value");
        EXPECT_EQ((Bytes{1, 2, 3, 4}), to) << "itemSize bytes, whatever the kind";
    }
}

// A stream with limits that can refuse.
class LimitedStream : public KFS_Stream {
public:
    explicit LimitedStream(KFS_ValueDesc const& desc)
        : KFS_Stream(1, 600, 0, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false)
    {}
    bool IsFloatBased() const override { return true; }
    void LegalizeValue(double* values) const override
    {
        if (values[0] < 0.0) throw 4711;
        if (values[0] > 1000.0) throw std::runtime_error("too much");
        values[0] = std::min(values[0], 100.0);
    }
};

TEST_F(Items, CopyingForcesValuesIntoTheLimits)
{
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    LimitedStream const stream(desc);
    struct Row {
        KFS_CopyItemFunc function;
        short kind;
        double from, to;
        int code;
    } const rows[] = {
        {KFSp_FakeCopyItemFunc, KFS_Item_KeyValue, 120.0, 100.0, 0},
        {KFSp_FakeCopyItemFunc, KFS_Item_Component, 120.0, 120.0, 0},
        {KFSp_FakeCopyItemFunc, KFS_Item_KeyValue, -1.0, -1.0, 4711},
        {KFSp_FakeCopyItemFuncNoLimits, KFS_Item_KeyValue, 120.0, 120.0, 0},
        {KFSp_ConvertItemToFloat, KFS_Item_KeyValue, 120.0, 120.0, 0},
        {KFSp_FakeCopyItemFunc, KFS_Item_KeyValue, 2000.0, 2000.0, Q_Err_Exception},
    };
    for (Row const& row : rows) {
        double to = 0.0;
        EXPECT_EQ(row.code, row.function(&stream, 0, row.kind, &row.from, &to));
        EXPECT_EQ(row.to, to);
    }
    EXPECT_EQ(1U, reports.Take().size());
}

// Doubles are limited in all forms that take them, external values in none, whoever has made the list.
TEST_F(Items, ADoubleFormLeavesNothingBehindInTheList)
{
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    double const value = 500.0;
    T_Time const times[] = {{0, 600}, {10, 600}, {20, 600}, {30, 600}};
    for (bool const doublesFirst : {false, true}) {
        SCOPED_TRACE(doublesFirst ? "a list that a double form has made" : "a list that an external form has made");
        LimitedStream stream(desc);
        auto const stored = [&](int index) {
            void const* item = nullptr;
            EXPECT_EQ(0, SEQ_GetConstAddress(stream.GetKeys(), index, &item));
            return *KFSp_Numbers(static_cast<KFS_KeyScalar const*>(item));
        };
        for (int i = 0; i < 4; ++i) {
            bool const doubles = (i % 2 == 0) == doublesFirst;
            ASSERT_EQ(0, doubles ? KFS_InsertKeyF(&stream, &times[i], 0, &value, KFS_Interp_Linear, KFS_Interp_Linear)
                                 : KFS_InsertKey(&stream, &times[i], 0, &value, KFS_Interp_Linear, KFS_Interp_Linear));
            EXPECT_EQ(doubles ? 100.0 : 500.0, stored(i));
            ASSERT_EQ(0, KFS_SetKey(&stream, i, &value, KFS_Interp_None, KFS_Interp_None));
            EXPECT_EQ(500.0, stored(i));
            ASSERT_EQ(0, KFS_SetKeyF(&stream, i, &value, KFS_Interp_None, KFS_Interp_None));
            EXPECT_EQ(100.0, stored(i));
        }
    }
}

TEST_F(Items, DoublesGoIntoACustomStreamThatHasRoom)
{
    for (unsigned short const itemSize : {8, 24, 7, 1}) {
        for (bool const noKeys : {false, true}) {
            SCOPED_TRACE(testing::Message() << itemSize << (noKeys ? ", constant" : ", keys"));
            bool const fits = itemSize >= 8;
            KFS_ValueDesc const desc{1, itemSize, 4711, OwnedValues::Interpolate};
            KFS_Stream stream(1, 600, noKeys, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
            T_Time const at{10, 600};
            double const value = 2.5;
            int const code = fits ? 0 : 7441;
            EXPECT_EQ(code, KFS_InsertKeyF(&stream, &at, 0, &value, KFS_Interp_Spline, KFS_Interp_Spline));
            EXPECT_EQ(code, KFS_InsertKeyF(&stream, &at, 1, &value, KFS_Interp_None, KFS_Interp_None));
            if (fits) {
                double out[3] = {};
                ASSERT_EQ(0, KFS_RemoveKey(&stream, 0, out));
                EXPECT_EQ(2.5, out[0]);
            } else {
                EXPECT_EQ(reports.Take(),
                          (std::vector<Reported>(2, KfsReport(81, "can#{rsquo}t convert to custom value"))));
            }
            EXPECT_EQ(1, stream.GetValueDesc()->isCustom);
            EXPECT_EQ(itemSize, stream.GetValueDesc()->itemSize);
            EXPECT_EQ(4711, stream.GetValueDesc()->dataType);
            EXPECT_EQ(OwnedValues::Interpolate, stream.GetInterpFunc());
            EXPECT_FALSE(stream.IsTemporarilyNonCustom());
        }
    }
}

TEST_F(Items, TheListFollowsTheStreamsFunctions)
{
    OwnedValues::Reset();
    auto const stream = OwnedValues::MakeStream(false);
    EXPECT_EQ(0, KFSp_SetKeyFuncs(stream.get())) << "nothing to tell without a list";
    ASSERT_EQ(0, KFSp_CreateKeyList(stream.get()));
    SEQ_Head** const list = stream->GetKeys();
    ASSERT_EQ(0, KFSp_CreateKeyList(stream.get()));
    EXPECT_EQ(list, stream->GetKeys()) << "made once";
    EXPECT_EQ(stream.get(), (*list)->refcon);
    for (int const which : {1, 2, 0, 3}) {
        (*list)->refcon = nullptr;
        ASSERT_EQ(0, KFS_SetCustomFuncs(stream.get(), which & 1 ? OwnedValues::Copy : nullptr,
                                        which & 2 ? OwnedValues::Dispose : nullptr));
        EXPECT_EQ(which & 1 ? KFSp_CopyKeyItemFunc : nullptr, (*list)->copy);
        EXPECT_EQ(which & 2 ? KFSp_DisposeKeyItemFunc : nullptr, (*list)->dispose);
        EXPECT_EQ(KFSp_SortKeyItemFunc, (*list)->sort);
        EXPECT_EQ(stream.get(), (*list)->refcon);
    }
}

TEST_F(Items, KeysSortByWrappedDifference)
{
    for (auto const& [first, second, order] :
         {std::tuple{1, 2, -1}, {2, 1, 1}, {5, 5, 0}, {-3, 4, -7}, {INT_MAX, -1, INT_MIN}}) {
        KFS_KeyScalar a{};
        KFS_KeyScalar b{};
        a.time = first;
        b.time = second;
        EXPECT_EQ(order, KFSp_SortKeyItemFunc(nullptr, nullptr, &a, &b));
        EXPECT_EQ(order, KFSp_SortKeyItemDiskFunc(nullptr, nullptr, &a, &b));
    }
}

}  // namespace
