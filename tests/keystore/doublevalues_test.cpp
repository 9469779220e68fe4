#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "keystore/edit.h"
#include "keystore/items.h"

#include "tests/support/ownedvalues.h"
#include "tests/support/streams.h"

#include <algorithm>
#include <array>
#include <random>

// What the forms that take doubles do to a stream of another kind, and leave of it.

namespace {

constexpr char None = KFS_Interp_None;
constexpr char Linear = KFS_Interp_Linear;
constexpr char Spline = KFS_Interp_Spline;

class DoubleValues : public StreamTest {};

// Doubles are limited in all forms that take them, external values in none, whoever has made the list.
class LimitedStream : public KFS_Stream {
public:
    explicit LimitedStream(KFS_ValueDesc const& desc)
        : KFS_Stream(1, 600, 0, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false)
    {}
    bool IsFloatBased() const override { return true; }
    void LegalizeValue(double* values) const override { *values = std::min(*values, 10.0); }
};

TEST_F(DoubleValues, ADoubleFormLeavesNothingBehindInTheList)
{
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    double const value = 50.0;
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
            ASSERT_EQ(0, doubles ? KFS_InsertKeyF(&stream, &times[i], 0, &value, Linear, Linear)
                                 : KFS_InsertKey(&stream, &times[i], 0, &value, Linear, Linear));
            EXPECT_EQ(doubles ? 10.0 : 50.0, stored(i));
            ASSERT_EQ(0, KFS_SetKey(&stream, i, &value, None, None));
            EXPECT_EQ(50.0, stored(i));
            ASSERT_EQ(0, KFS_SetKeyF(&stream, i, &value, None, None));
            EXPECT_EQ(10.0, stored(i));
        }
    }
}

TEST_F(DoubleValues, DoublesGoIntoACustomStreamThatHasRoom)
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
            EXPECT_EQ(code, KFS_InsertKeyF(&stream, &at, 0, &value, Spline, Spline));
            EXPECT_EQ(code, KFS_InsertKeyF(&stream, &at, 1, &value, None, None));
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

// One script through the typed functions and through those that take doubles.
TEST_F(DoubleValues, TypedFormsDoWhatDoubleFormsDo)
{
    for (signed char const type :
         {KFS_Type_S8, KFS_Type_S16, KFS_Type_S32, KFS_Type_Fixed, KFS_Type_Float, KFS_Type_Double}) {
        for (bool const spatial : {false, true}) {
            SCOPED_TRACE(testing::Message() << "type " << int{type} << (spatial ? ", spatial" : ""));
            StreamOptions const options{.dimension = 2, .spatial = spatial, .type = type};
            TestStream const typed(options), doubles(options);
            std::mt19937 random(7);
            auto const pick = [&](int count) { return static_cast<int>(random() % static_cast<unsigned>(count)); };
            for (int step = 0; step < 200; ++step) {
                double const value[2] = {pick(200) - 100.0, pick(200) - 100.0};
                std::array<double, 2> external{};
                ASSERT_EQ(0, KFS_ConvertItemFromFloat(2, type, value, external.data()));
                T_Time const at = typed.Time(pick(40) * 50);
                auto const in = static_cast<char>(pick(4)), out = static_cast<char>(pick(4));
                int const index = pick(std::max(1, typed.Count()));
                int a = 0, b = 0;
                switch (pick(typed.Count() < 4 ? 1 : 4)) {
                case 0:
                    a = KFS_InsertKey(typed, &at, 1, external.data(), in, out);
                    b = KFS_InsertKeyF(doubles, &at, 1, value, in, out);
                    break;
                case 1:
                    a = KFS_SetKey(typed, index, external.data(), in, out);
                    b = KFS_SetKeyF(doubles, index, value, in, out);
                    break;
                case 2:
                    a = spatial ? KFS_SetKeySpaceTangents(typed, index, 0, external.data(), nullptr)
                                : KFS_SetKeyVelocity(typed, index, external.data(), nullptr);
                    b = spatial ? KFS_SetKeySpaceTangentsF(doubles, index, 0, value, nullptr)
                                : KFS_SetKeyVelocityF(doubles, index, value, nullptr);
                    break;
                default: {
                    std::array<unsigned char, 16> read{}, expected{};
                    a = KFS_GetValue(typed, &at, 0, read.data(), nullptr, nullptr);
                    std::vector<double> const number = doubles.At(at.value);
                    ASSERT_EQ(0, KFS_ConvertItemFromFloat(2, type, number.data(), expected.data()));
                    EXPECT_EQ(expected, read);
                }
                }
                ASSERT_EQ(a, b) << "step " << step;
                ASSERT_EQ(typed.Stale(), doubles.Stale());
                ASSERT_EQ(typed.Times(), doubles.Times());
                for (int i = 0; i < typed.Count(); ++i)
                    ASSERT_EQ(typed.Numbers(i), doubles.Numbers(i)) << "step " << step;
            }
        }
    }
}

}  // namespace
