#include "keystore/attributes.h"
#include "overrides/expression.h"
#include "overrides/parambag.h"
#include "overrides/streamexpression.h"
#include "tests/support/groups.h"
#include "tests/support/listening.h"
#include "tests/support/text.h"

#include <boost/make_shared.hpp>

#include <algorithm>
#include <limits>
#include <string_view>

namespace {

using hearth::utility::Guid;

Guid GuidOf(unsigned char first)
{
    std::array<unsigned char, 16> bytes{};
    bytes[0] = first;
    return Guid(bytes);
}

// Records every byte by comparing the hash with one that is fed the expected bytes.
template <class Value>
Guid HashOf(Value const& value)
{
    KFS_OverrideHash hash;
    value.MixIn(hash);
    return hash.GetGuid();
}
Guid HashOfBytes(std::string_view bytes)
{
    KFS_OverrideHash hash;
    hash.Mix(bytes.data(), bytes.size());
    return hash.GetGuid();
}

KFS_TextStreamTextRunInfo MakeRun(int length, char const* name, float size, unsigned char attribute)
{
    KFS_TextStreamTextRunInfo run;
    run.length = length;
    run.name = Text(name);
    run.size = size;
    run.attributes = {1, 2, 3, attribute};
    return run;
}

KFS_TextStreamInfo Styled(char const* text, unsigned char attribute, std::vector<KFS_TextStreamTextRunInfo> runs)
{
    KFS_TextStreamInfo info;
    info.text = Text(text);
    info.attribute2 = attribute;
    info.runs = std::move(runs);
    return info;
}

// Ascending values: each is smaller than those behind it, equal to itself, and hashes like no other.
template <class Value>
void ExpectAscending(std::vector<Value> const& values)
{
    for (std::size_t i = 0; i < values.size(); ++i)
        for (std::size_t j = 0; j < values.size(); ++j) {
            SCOPED_TRACE(testing::Message() << i << " and " << j);
            EXPECT_EQ(i == j, values[i] == values[j]);
            EXPECT_EQ(i != j, values[i] != values[j]);
            EXPECT_EQ(i < j, values[i] < values[j]);
            EXPECT_EQ(i == j, HashOf(values[i]) == HashOf(values[j]));
        }
}

TEST(OverrideValues, AreOrderedFieldByField)
{
    std::vector<KFS_TextStreamTextRunInfo> const runs{
        MakeRun(-1, "b", 9, 9),  MakeRun(2, "", 9, 9),   MakeRun(2, "a", -1, 9), MakeRun(2, "a", 2, 3),
        MakeRun(2, "a", 2, 200), MakeRun(2, "aa", 0, 0), MakeRun(2, "b", 0, 0),  MakeRun(3, "", 0, 0)};
    ExpectAscending(runs);
    ExpectAscending<KFS_TextStreamInfo>({Styled("", 7, {}), Styled("a", 1, {}), Styled("a", 1, {runs[1]}),
                                         Styled("a", 1, {runs[1], runs[0]}), Styled("a", 1, {runs[2]}),
                                         Styled("a", 200, {}), Styled("b", 0, {})});
    ExpectAscending<KFS_AlternateSourceInfo>(
        {{-1, GuidOf(9)}, {}, {0, GuidOf(3)}, {0, GuidOf(200)}, {1, Guid()}, {1, GuidOf(1)}});

    auto const nan = MakeRun(2, "a", std::numeric_limits<float>::quiet_NaN(), 3);
    EXPECT_FALSE(nan == nan);
    EXPECT_TRUE(nan != nan);
    for (auto const& other : {nan, runs[3]}) EXPECT_FALSE(nan < other || other < nan);

    EXPECT_TRUE(Styled("", 0, {}).Verify());
    EXPECT_TRUE(Styled("12345", 0, {MakeRun(2, "", 0, 0), MakeRun(3, "", 0, 0)}).Verify());
    EXPECT_FALSE(Styled("12345", 0, {MakeRun(2, "", 0, 0), MakeRun(2, "", 0, 0)}).Verify());
    EXPECT_TRUE(Styled("1", 0,
                       {MakeRun(INT_MAX, "", 0, 0), MakeRun(INT_MAX, "", 0, 0), MakeRun(INT_MIN, "", 0, 0),
                        MakeRun(INT_MIN, "", 0, 0), MakeRun(3, "", 0, 0)})
                    .Verify());
}

TEST(OverrideValues, FeedTheirBytesToAHash)
{
    using namespace std::string_view_literals;
    EXPECT_EQ(HashOfBytes(""), HashOf(KFS_AlternateSourceInfo()));
    EXPECT_EQ(HashOfBytes("\1\0\0\0"sv), HashOf(KFS_AlternateSourceInfo(1, Guid())));
    EXPECT_EQ(HashOfBytes("\5\0\0\0\0\0\0\0\0\0\0\0\0\0\0\0"sv), HashOf(KFS_AlternateSourceInfo(0, GuidOf(5))));
    EXPECT_EQ(HashOfBytes("a\0b\0\0\0\7\2\0\0\0n\0\0\0\200?\1\2\3\4"sv),
              HashOf(Styled("ab", 7, {MakeRun(2, "n", 1.0F, 4)})));
}

class Bags : public SceneTest {
protected:
    using Override = boost::shared_ptr<KFS_StreamOverride>;

    TestRoot<TestIndexedGroup> root_{"layers"};
    KFS_Stream const* const a_ = Leaf();
    KFS_Stream const* const b_ = Leaf();

    KFS_Stream* Leaf()
    {
        Q_ScAutoPtr<KFS_StreamBase> leaf = TestKinds::Make("opacity");
        return root_.GetEditableStream(root_.AppendStream(&leaf))->GetAsLeaf();
    }
    static Override Fixed(KFS_Stream const* stream, double value, bool forEffect = false)
    {
        return boost::make_shared<KFS_StreamOverride>(stream, KFS_OverrideValue(std::vector<double>{value}), forEffect);
    }
    // Twice the time, in seconds, more than its own value.
    static Override Computed(KFS_Stream const* stream, double value, KFS_Stream const* getter, int offset,
                             unsigned char identity)
    {
        auto const func = [](T_Time const& time, KFS_OverrideValue& number) {
            boost::get<std::vector<double>>(number)[0] += 2.0 * time.value / time.scale;
        };
        return boost::make_shared<KFS_StreamOverride>(stream, KFS_OverrideValue(std::vector<double>{value}), getter,
                                                      T_Time{offset, 10}, func, GuidOf(identity), false);
    }
    double Read(KFS_Stream const* stream, int seconds, KFS_ParamBag const* bag)
    {
        T_Time const time{seconds, 1};
        double value = -1;
        EXPECT_EQ(0, KFS_GetValueFPlus(stream, &time, 0, &value, nullptr, bag));
        return value;
    }
};

TEST_F(Bags, OverridesAreComparedFromTheLeft)
{
    KFS_Stream const* const low = std::min(a_, b_, std::less<>());
    KFS_Stream const* const high = std::max(a_, b_, std::less<>());
    auto const effect = [](Override const& plain) {
        KFS_StreamOverride copy(*plain);
        copy.SetIgnoreExpressions(true);
        return copy;
    };
    auto const text = [](KFS_Stream const* stream, char const* value) {
        return KFS_StreamOverride(stream, KFS_OverrideValue(Text(value)), false);
    };
    ExpectAscending<KFS_StreamOverride>({text(low, "a"), text(low, "b"), *Fixed(low, 1), *Fixed(low, 1, true),
                                         effect(Fixed(low, 1)), *Fixed(low, 2), *Fixed(high, 0)});
    ExpectAscending<KFS_StreamOverride>({*Computed(low, 1, low, 0, 1), effect(Computed(low, 7, low, 0, 1)),
                                         *Computed(low, 1, low, 0, 2), *Computed(low, 1, low, 5, 0),
                                         *Computed(low, 1, high, 0, 0), *Computed(high, 0, low, 0, 0)});
    // The value of one with a getter doesn't count; that the right one has a getter isn't seen from the left.
    EXPECT_TRUE(*Computed(a_, 1, b_, 3, 1) == *Computed(a_, 2, b_, 3, 1));
    EXPECT_TRUE(*Fixed(a_, 1) == *Computed(a_, 1, b_, 3, 1));
    EXPECT_FALSE(*Computed(a_, 1, b_, 3, 1) == *Fixed(a_, 1));
    EXPECT_FALSE(*Computed(a_, 1, b_, 3, 1) < *Computed(a_, 2, b_, 3, 1));

    Override const fixed = Fixed(a_, 1, true);
    EXPECT_TRUE(fixed->IsTimeInvariant() && fixed->GetIsForEffectStream() && !fixed->GetIgnoreExpressions());
    KFS_Stream const* getter = a_;
    T_TimeSpan span{{1, 2}, {3, 4}};
    EXPECT_FALSE(fixed->GetValueGetterStream(&getter, &span));
    EXPECT_EQ(a_, getter);
    EXPECT_TRUE(Computed(a_, 1, b_, 5, 1)->GetValueGetterStream(&getter, nullptr));
    EXPECT_EQ(b_, getter);
    EXPECT_TRUE(Computed(a_, 1, b_, 5, 1)->GetValueGetterStream(&getter, &span));
    EXPECT_EQ((T_Time{1, 1}), span.start);
    EXPECT_EQ((T_Time{3, 4}), span.duration);
}

TEST_F(Bags, NameTheirContent)
{
    KFS_ParamBag empty, one, two;
    KFS_OverrideHash hash;
    hash.Mix("KFS_ParamBag", 12);
    EXPECT_EQ(hash.GetGuid(), empty.GetGUID());
    EXPECT_TRUE(empty.IsEmpty() && empty.IsTimeInvariant());

    one.AddOverride(a_, Fixed(a_, 1));
    one.AddOverride(b_, Fixed(b_, 2, true));
    two.AddOverride(b_, Fixed(b_, 3));
    EXPECT_NE(one, two);
    two.AddOverride(b_, Fixed(b_, 2, true));
    two.AddOverride(a_, Fixed(a_, 1));
    EXPECT_EQ(one, two) << "the order in which they came, and what was replaced, leave no trace";
    EXPECT_EQ(0, one.GetSortOrder(two));
    hash = {};
    hash.Mix("KFS_ParamBag", 12);
    for (KFS_Stream const* const stream : {a_, b_}) {
        u16str const& id = stream->GetStreamCapsuleData().id;
        hash.Mix(id.data(), 2 * id.size());
        (stream == a_ ? Fixed(a_, 1) : Fixed(b_, 2, true))->MixIn(hash);
    }
    EXPECT_EQ(hash.GetGuid(), one.GetGUID());

    KFS_ParamBag copy(one);
    EXPECT_EQ(one, copy);
    EXPECT_NE(0, copy.GetSortOrder(empty));
    EXPECT_EQ(-copy.GetSortOrder(empty), empty.GetSortOrder(copy));
    EXPECT_EQ(copy.GetGUID() < empty.GetGUID() ? -1 : 1, copy.GetSortOrder(empty));
    KFS_StreamOverride const* found = nullptr;
    ASSERT_TRUE(copy.GetStreamOverride(a_, &found));
    const_cast<KFS_StreamOverride*>(found)->SetIgnoreExpressions(true);
    EXPECT_EQ(one, copy) << "remembered";
    copy.SetDirty();
    EXPECT_NE(one, copy) << "asked anew, and overrides are shared";
    copy.Clear();
    EXPECT_EQ(empty, copy);
    copy = one;
    EXPECT_EQ(2u, copy.GetOverrideCount());
}

TEST_F(Bags, MergeAndDiffer)
{
    KFS_ParamBag a, b, empty;
    Override const first = Fixed(a_, 1);
    a.AddOverride(a_, first);
    b.AddOverride(a_, Fixed(a_, 9));
    b.AddOverride(b_, Fixed(b_, 2));
    KFS_StreamOverride const* found = nullptr;
    EXPECT_FALSE(a.GetStreamOverride(b_, &found));
    EXPECT_EQ(nullptr, found);
    KFS_ParamBag const merged(a, b);
    ASSERT_TRUE(merged.GetStreamOverride(a_, &found));
    EXPECT_EQ(first.get(), found) << "the first bag wins";
    EXPECT_TRUE(merged.StreamOverridden(b_));

    using Difference = std::vector<Override>;
    EXPECT_EQ(1u, a.FindRightySymmetricDifference(b, false).size());
    EXPECT_EQ(9.0, boost::get<std::vector<double>>(a.FindRightySymmetricDifference(b, false)[0]->GetValue())[0]);
    EXPECT_EQ(Difference(), a.FindRightySymmetricDifference(b, true));
    EXPECT_EQ(Difference(), b.FindRightySymmetricDifference(b, false));
    EXPECT_EQ(Difference(), empty.FindRightySymmetricDifference(b, false));

    struct Row {
        KFS_ParamBag const* a;
        KFS_ParamBag const* b;
        KFS_ParamBag const* expected;
    };
    KFS_ParamBag const other;
    for (Row const& row : {Row{nullptr, nullptr, nullptr}, Row{&empty, nullptr, &empty}, Row{nullptr, &empty, &empty},
                           Row{&empty, &other, &empty}, Row{&a, nullptr, &a}, Row{&a, &empty, &a}, Row{&empty, &b, &b},
                           Row{nullptr, &b, &b}})
        EXPECT_EQ(row.expected, KFS_MergedParamBagHelper(row.a, row.b).Get());
    KFS_MergedParamBagHelper const both(&a, &b);
    EXPECT_EQ(merged, *both.Get());
}

TEST_F(Bags, TakeThePlaceOfAStreamsKeys)
{
    KFS_ParamBag bag;
    bag.AddOverride(a_, Computed(a_, 5, nullptr, 0, 1));
    EXPECT_FALSE(bag.IsTimeInvariant());
    EXPECT_EQ(100, Read(a_, 3, nullptr));
    EXPECT_EQ(11, Read(a_, 3, &bag));
    EXPECT_EQ(11, Read(a_, 3, &bag)) << "each time from a fresh copy of the value";
    EXPECT_EQ(9, Read(a_, 2, &bag));
    EXPECT_EQ(100, Read(b_, 2, &bag));
    auto const render = kfshost::MakeRenderContext(true);
    auto const readInRender = [&] {
        Q_ScSetCurrentRenderContext const current(render);
        return Read(a_, 3, &bag);
    };
    EXPECT_EQ(11, readInRender());
    EXPECT_EQ(0, KFS_RescaleStream(const_cast<KFS_Stream*>(a_), 24));
    EXPECT_EQ(11, Read(a_, 3, &bag));
    EXPECT_EQ(11, readInRender()) << "which still counts time as the stream did";
    EXPECT_EQ(100, Read(a_, 2, nullptr)) << "the stream itself hasn't heard of it";
    KFS_OverrideValue value(Text("as it was"));
    EXPECT_FALSE(bag.StreamOverridden(b_, T_Time{1, 1}, &value));
    EXPECT_EQ(0, value.which());
    EXPECT_TRUE(bag.StreamOverridden(a_, T_Time{1, 1}, &value));
    EXPECT_EQ(7.0, boost::get<std::vector<double>>(value)[0]);
    bag.AddOverride(a_, boost::make_shared<KFS_StreamOverride>(a_, KFS_OverrideValue(Text("text")), false));
    EXPECT_EQ(100, Read(a_, 2, &bag)) << "a text is no value of a plain stream";
}

TEST_F(Bags, ExpressionsKeepWhatAnEngineNeeds)
{
    auto* const stream = const_cast<KFS_Stream*>(a_);
    ValueListener heard;
    EXPECT_EQ(u16str(), KFS_SetStreamExpression(stream, Text("x")));
    auto& info = stream->GetExprInfoForModify();
    auto const fill = [&] {
        info.SetExpressionCache(17);
        info.AddDependency(5);
        info.AddDependency(3);
        KFS_SetStreamExprErrorMessage(stream, Text("broken"), 4, Text("b"));
    };
    fill();
    EXPECT_EQ(Text("broken"), KFS_GetStreamExprErrorMessage(stream));
    EXPECT_EQ(4, KFS_GetStreamExprErrorLineNum(stream));
    EXPECT_EQ(Text("b"), KFS_GetStreamShortExprErrorMessage(stream));
    EXPECT_TRUE(stream->HasExpressionError() && stream->HasEnabledExpression() && !stream->HasActiveExpression());
    std::set<int> ids{99};
    stream->GetExpressionDependencyIds(ids);
    EXPECT_EQ((std::set<int>{3, 5}), ids);
    ids = {99};
    root_.GetExpressionDependencyIds(ids);
    EXPECT_EQ((std::set<int>{3, 5, 99}), ids);

    KFS_ExprInfo copy(info);
    info.SetExpressionCache(18);
    EXPECT_EQ(17, boost::any_cast<int>(copy.GetExpressionCache()));
    EXPECT_EQ(ids.size() - 1, copy.GetDependencyIds().size());
    copy.swap(info);
    EXPECT_EQ(18, boost::any_cast<int>(copy.GetExpressionCache()));
    {
        Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
        EXPECT_TRUE(info.GetExpressionCache().empty());
        info.SetExpressionCache(19);
        EXPECT_EQ(19, boost::any_cast<int>(info.GetExpressionCache()));
    }
    EXPECT_EQ(17, boost::any_cast<int>(info.GetExpressionCache())) << "a render's cache is its own";

    static_cast<void>(heard.Take());
    EXPECT_EQ(0, KFS_SetStreamExprFlags(stream, 2, 2));
    EXPECT_TRUE(stream->HasExpressionError());
    EXPECT_EQ(0, KFS_SetStreamExprFlags(stream, 1, 1));
    EXPECT_FALSE(stream->HasExpressionError());
    EXPECT_EQ(3u, KFS_GetStreamExprFlags(stream));
    fill();
    EXPECT_EQ(Text("x"), KFS_SetStreamExpression(stream, Text("x")));
    EXPECT_TRUE(info.GetExpressionCache().empty() && info.GetDependencyIds().empty() && !info.HasExpressionError());
    EXPECT_EQ(3, heard.Take());
    info.SetExpression(u16str());
    info.SetExpressionError(Text("e"), 1, u16str());
    EXPECT_FALSE(stream->HasExpressionError()) << "no text, no error";
    info.clear();
    EXPECT_EQ(0u, info.GetFlags());
    EXPECT_EQ(-1, info.GetExpressionErrorLine());
}

}  // namespace
