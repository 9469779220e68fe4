#include "keystore/stream.h"

#include "frame/errors.h"
#include "keystore/attributes.h"
#include "overrides/streamexpression.h"
#include "tests/persist/leaffile.h"
#include "tests/support/listening.h"
#include "tests/support/ownedvalues.h"

#include <random>

namespace {

class LeafRead : public StreamTest {};

// A leaf of a class of its own: its dimension and what its values are can't change.
class FixedLeaf : public KFS_Stream {
public:
    explicit FixedLeaf(short dimension = 1, KFS_MatchName const* name = nullptr)
        : KFS_Stream(dimension, 600, 1, false, KFS_InterpMask_All, 0, {.dataType = KFS_Type_Double}, name, nullptr,
                     false)
    {
        FixedLeaf::InsertDefaultKey(T_Time{0, 600});
    }
    void InsertDefaultKey(T_Time const& time) override
    {
        std::vector<double> const value(static_cast<std::size_t>(GetDimension()), 42.0);
        KFSp_ThrowIf(KFS_InsertKeyF(this, &time, 1, value.data(), 0, 0));
    }
    bool CanBeAnimated() const override { return canBeAnimated; }
    double Value() const
    {
        T_Time const at{0, GetTimeScale()};
        double value[8] = {};
        EXPECT_EQ(0, KFS_GetValueFPlus(this, &at, 0, value, nullptr, nullptr));
        return value[0];
    }
    int Count() const { return GetKeys() ? (*GetKeys())->count : 0; }

    bool canBeAnimated = true;
};

std::string Value(std::vector<double> const& numbers)
{
    return Atom("cdat", Doubles(numbers));
}
std::string const OneValue = Value({2.5, 0, 0, 0, 0});
std::string const TwoKeys = Keys(48, {ScalarKey(0, 1.0), ScalarKey(100, 3.0)});

TEST_F(LeafRead, AConstantByHand)
{
    LeafRecord record;
    record.Put(8, Short(5)).Put(6, Short(3)).Put(12, Long(30)).Put(16, Double(0.25)).Put(24, Doubles({2, 3, 4, 5}));
    record.Put(72, Long(17)).Put(76, "\x02\x03").Put(78, Short(0x19)).Put(60, "\x02").Put(0, Short(1));
    TestStream stream({.dimension = 3, .spatial = true});
    stream.Key(3, {1, 2, 3}).Key(9, {4, 5, 6});  // all of it is replaced
    ASSERT_EQ(0, ReadLeaf(stream, Form(Leaf(record, OneValue))));
    EXPECT_EQ(1, stream->GetDimension());
    EXPECT_EQ(KFS_StreamFlag_NoKeys, stream->GetKFSFlags());
    EXPECT_EQ(3, stream->GetSpInterp());
    EXPECT_EQ(5, stream->GetSpInterpMask());
    EXPECT_EQ(KFS_InterpMask_All, stream->GetInterpMask());
    EXPECT_EQ(30u, stream->GetTimeScale());
    EXPECT_EQ(0.25, stream->GetAccuracy());
    EXPECT_EQ((M_Vector4T<double>{2, 3, 4, 5}), stream->GetMultiplier());
    EXPECT_EQ(KFS_Type_S16, stream->GetValueDesc()->dataType & 0xFF);
    EXPECT_EQ(2, stream->GetValueDesc()->itemSize);
    KFS_KeyScalar const* const cache = stream->GetCache();
    EXPECT_EQ(17, cache->time);
    EXPECT_EQ(2, cache->inInterp);
    EXPECT_EQ(3, cache->outInterp);
    EXPECT_EQ(0x18, cache->flags) << "the layout is the stream's";
    EXPECT_EQ(KFS_StreamValidStamp, stream->GetStamp());
    EXPECT_EQ(nullptr, stream->GetKeys());
    EXPECT_EQ(TestStream::NotStale, stream.Stale());
    EXPECT_EQ(2.5, stream.At1(0));
}

// A short record ends in zeros; of a long one the front counts.
TEST_F(LeafRead, RecordsOfOtherLengths)
{
    LeafRecord record;
    record.HasExpression(0x80000006);
    for (std::size_t const size : {12u, 16u, 60u, 61u, 72u, 119u}) {
        SCOPED_TRACE(size);
        TestStream stream;
        ASSERT_EQ(0, ReadLeaf(stream, Form(Leaf(record.Bytes().substr(0, size), OneValue))));
        EXPECT_EQ(1, stream->GetDimension());
        EXPECT_EQ(size < 16 ? 0u : 600u, stream->GetTimeScale());
        EXPECT_EQ(size < 61 ? KFS_Type_S8 : KFS_Type_Double, stream->GetValueDesc()->dataType & 0xFF);
        EXPECT_FALSE(stream->HasExpression());
    }
    TestStream stream;
    ASSERT_EQ(0,
              ReadLeaf(stream, Form(Leaf(record.Bytes() + std::string(33, 'x'), OneValue + Atom("Utf8", "wiggle")))));
    EXPECT_EQ(Text("wiggle"), KFS_GetStreamExpression(stream));
    EXPECT_EQ(0x80000006u, KFS_GetStreamExprFlags(stream));
    EXPECT_EQ(2.5, stream.At1(0));
}

TEST_F(LeafRead, AnotherChunkWhereTheRecordShouldBe)
{
    TestStream stream;
    stream.Key(0, {1.0});
    std::vector<unsigned char> const before = stream.Bytes();
    std::string const record = LeafRecord();
    for (std::string const& wrong :
         {Atom("kfb3", record), Atom("cdat", record) + Atom("kfb4", record), List("kfb4", record)}) {
        EXPECT_EQ(KFS_Err_BadFileInfo, ReadLeaf(stream, Form(List("kfbs", Base() + wrong))));
        EXPECT_REPORT(reports, 12, "invalid time stream information in file (unrecognized chunk ID).");
    }
    EXPECT_EQ(CKF_Err_NoSuchChunk, ReadLeaf(stream, Form(List("kfbs", Base()))));
    EXPECT_EQ(CKF_Err_NoSuchChunk, ReadLeaf(stream, Form(List("kfgp", Base()))));
    EXPECT_EQ(CKF_Err_NoSuchChunk, ReadLeaf(stream, Form(Leaf(LeafRecord(), "")))) << "no value";
    TestStream other;
    EXPECT_EQ(CKF_Err_NoSuchChunk, ReadLeaf(other, Form(Leaf(LeafRecord().Flags(0).HasList(), OneValue)))) << "no keys";
    EXPECT_EQ(0, other.Count());
}

// What no stream can be is refused before the stream is touched.
TEST_F(LeafRead, ImpossibleDescriptions)
{
    LeafRecord const records[] = {LeafRecord().Dimension(-1),
                                  LeafRecord().Dimension(32767),
                                  LeafRecord().Dimension(819),
                                  LeafRecord().Put(60, "\x0A"),
                                  LeafRecord().Put(56, Short(1)).Put(58, Short(0xFFFF)),
                                  LeafRecord().Dimension(1365).Flags(3)};
    for (LeafRecord const& record : records) {
        SCOPED_TRACE(MemoryFile::Hex(Span(record.Bytes())));
        TestStream stream({.dimension = 2});
        stream.Key(0, {1, 2}).Key(10, {3, 4});
        EXPECT_EQ(KFS_Err_BadValueDesc, ReadLeaf(stream, Form(Leaf(record, OneValue))));
        EXPECT_EQ((std::vector<double>{2, 3}), stream.At(5));
    }
}

TEST_F(LeafRead, AStreamOfTheBaseClassBecomesACustomOne)
{
    LeafRecord record;
    record.Put(56, Short(1)).Put(58, Short(3)).Put(60, "\xFF");
    TestStream stream;
    ASSERT_EQ(0, ReadLeaf(stream, Form(Leaf(record, Atom("cdat", "abc")))));
    EXPECT_TRUE(stream->IsCustom());
    char value[4] = "---";
    T_Time const at{0, 600};
    EXPECT_EQ(0, KFS_GetValuePlus(stream, &at, 0, value, nullptr, nullptr, nullptr, 0));
    EXPECT_STREQ("abc", value);
}

TEST_F(LeafRead, ADerivedClassKeepsItsDimension)
{
    KFS_MatchName const name("@1 knob", true);
    FixedLeaf stream(2, &name);
    EXPECT_EQ(KFS_Err_BadFileInfo, ReadLeaf(&stream, Form(Leaf(LeafRecord().Dimension(-3), OneValue))));
    EXPECT_EQ((std::vector<Reported>{
                  {0x1D000C, 4, "property of type \"@1 knob\" had dimension -3 in file, but we expected 2", 0}}),
              reports.Take());
    EXPECT_EQ(42.0, stream.Value());
    // What values are and the spatial mask stay; the rest is the file's.
    LeafRecord record;
    record.Dimension(2).Put(60, "\x02").Put(8, Short(77)).Put(12, Long(25));
    ASSERT_EQ(0, ReadLeaf(&stream, Form(Leaf(record, Value({7, 8, 0, 0, 0, 0, 0, 0, 0, 0})))));
    EXPECT_EQ(KFS_Type_Double, stream.GetValueDesc()->dataType & 0xFF);
    EXPECT_EQ(0, stream.GetSpInterpMask());
    EXPECT_EQ(25u, stream.GetTimeScale());
    EXPECT_EQ(7.0, stream.Value());
}

// Another layout of records than the class has: its default, and the file's expression.
TEST_F(LeafRead, ADerivedClassKeepsItsSpatialFlag)
{
    for (bool const fileHasKeys : {false, true}) {
        SCOPED_TRACE(fileHasKeys);
        FixedLeaf stream;
        stream.GetCache()->time = 5;
        LeafRecord record;
        record.Flags(KFS_StreamFlag_Spatial | (fileHasKeys ? 0 : KFS_StreamFlag_NoKeys)).HasExpression();
        std::string rest = fileHasKeys ? Keys(80, {std::string(80, '\x11')}) : Value({1, 2, 3});
        if (fileHasKeys) record.HasList();
        ASSERT_EQ(0, ReadLeaf(&stream, Form(Leaf(record, rest + Atom("Utf8", "time")))));
        EXPECT_FALSE(stream.IsSpatial());
        EXPECT_TRUE(stream.HasNoKeys());
        EXPECT_EQ(0, stream.Count());
        EXPECT_EQ(42.0, stream.Value());
        EXPECT_EQ(Text("time"), KFS_GetStreamExpression(&stream));
    }
}

TEST_F(LeafRead, APropertyThatDoesNotAnimateBecomesConstant)
{
    std::string const file = Form(Leaf(LeafRecord().Flags(0).HasList(), TwoKeys));
    FX_ParamDef def{};
    def.paramType = FX_Param_NotFilledIn;
    for (int const kind : {-1, static_cast<int>(FX_Param_COLOR), static_cast<int>(FX_Param_ALWAYS_SAVED)}) {
        for (bool const canBeAnimated : {false, true}) {
            SCOPED_TRACE(testing::Message() << kind << ' ' << canBeAnimated);
            FixedLeaf stream;
            def.paramType = kind;
            stream.SetParamDef(def);
            stream.canBeAnimated = canBeAnimated;
            ASSERT_EQ(0, ReadLeaf(&stream, file));
            bool const staysKeyed = canBeAnimated || kind == FX_Param_ALWAYS_SAVED;
            EXPECT_EQ(staysKeyed, stream.HasKeys());
            EXPECT_EQ(staysKeyed ? 2 : 0, stream.Count());
            EXPECT_EQ(1.0, stream.Value());
        }
    }
}

// The value of a constant that the file turns into keys is gone, also where there is no key.
TEST_F(LeafRead, KeysOfWhichThereAreNone)
{
    for (bool const hasList : {false, true}) {
        SCOPED_TRACE(hasList);
        FixedLeaf stream;
        LeafRecord record;
        record.Flags(0).Put(68, hasList ? "\x01" : std::string(1, '\0'));
        ASSERT_EQ(0, ReadLeaf(&stream, Form(Leaf(record, hasList ? Keys(48, {}) : ""))));
        EXPECT_EQ(KFS_INVALID_INDEX, stream.GetCache()->time);
        EXPECT_TRUE(stream.HasNoValue());
    }
}

TEST_F(LeafRead, SkippedLeavesTakeNothing)
{
    FixedLeaf stream;
    stream.SetStreamBaseFlags(KFS_BaseFlag_SkipLeafRead, KFS_BaseFlag_SkipLeafRead);
    CKF_File open;
    std::string const file = Form(Leaf(LeafRecord(), OneValue));
    ASSERT_EQ(0, open.Open(Span(file)));
    EXPECT_EQ(0, Thrown([&] { stream.Read(&open, nullptr); }));
    EXPECT_EQ(42.0, stream.Value());
    stream.SetStreamBaseFlags(0, KFS_BaseFlag_SkipLeafRead);
    EXPECT_EQ(0, Thrown([&] { stream.Read(&open, nullptr); })) << "the chunk is still there";
    EXPECT_EQ(2.5, stream.Value());
}

TEST_F(LeafRead, WhoHasEnteredTheListPassesIt)
{
    std::string const file = Form(Leaf(LeafRecord(), Atom("what", "?") + OneValue) + Atom("next", "abcd"));
    CKF_File open;
    ASSERT_EQ(0, open.Open(Span(file)));
    TestStream stream;
    {
        CKF_ScDescendList const list(&open, CKF_Id("kfbs"), nullptr, nullptr);
        EXPECT_EQ(0, Thrown([&] { stream->Read(&open, list.GetChunkInfo()); }));
    }
    EXPECT_EQ(2.5, stream.At1(0));
    EXPECT_EQ("next:4", Outline(&open));
}

// Kinds of sliders: a range of the parameter, or its limits where the file has none.
TEST_F(LeafRead, RangesOfSliders)
{
    struct {
        double low, high, expectedLow, expectedHigh;
        int major;
        unsigned flagsBefore;
    } const cases[] = {{-1, 7, -1, 7, 95, 0}, {0, 0, -10, 10, 95, 0}, {0, 1, 0, 1, 95, 0},
                       {-1, 7, -1, 7, 61, 0}, {-1, 7, 3, 4, 60, 0},   {-1, 7, 3, 4, 95, KFS_BaseFlag_Reserved8}};
    for (auto const& c : cases) {
        SCOPED_TRACE(testing::Message() << c.low << ' ' << c.high << ' ' << c.major << ' ' << c.flagsBefore);
        FixedLeaf stream;
        FX_ParamDef def{};
        def.paramType = FX_Param_FLOAT_SLIDER;
        def.value.floatSlider.validMin = -10;
        def.value.floatSlider.validMax = 10;
        def.value.floatSlider.sliderMin = 3;
        def.value.floatSlider.sliderMax = 4;
        stream.SetParamDef(def);
        stream.SetStreamBaseFlags(c.flagsBefore, KFS_BaseFlag_Reserved8);
        std::string const range = Atom("kfum", Double(c.low)) + Atom("kfuM", Double(c.high));
        ASSERT_EQ(0,
                  ReadLeaf(&stream, Form(Leaf(LeafRecord(), OneValue + range), static_cast<std::uint32_t>(c.major))));
        EXPECT_EQ(c.expectedLow, stream.GetUIMinValue());
        EXPECT_EQ(c.expectedHigh, stream.GetUIMaxValue());
    }
}

// The flag as the file has it counts for the next read, not for this one.
TEST_F(LeafRead, AFilesFlagDoesNotHideItsOwnAtoms)
{
    FixedLeaf stream;
    FX_ParamDef def{};
    def.paramType = FX_Param_PATH;
    stream.SetParamDef(def);
    std::string const file = Form(List("kfbs", Base(KFS_BaseFlag_Reserved8) + Atom("kfb4", LeafRecord()) + OneValue +
                                                   Atom("kfli", Long(0xFEDCBA98))));
    ASSERT_EQ(0, ReadLeaf(&stream, file));
    EXPECT_EQ(0xFEDCBA98u, stream.GetParamDef().value.path.pathIdentifier);
    EXPECT_EQ(static_cast<unsigned>(KFS_BaseFlag_Reserved8), stream.GetStreamBaseFlags());
}

TEST_F(LeafRead, TextOfAnExpressionInOldFiles)
{
    std::string const leaf =
        Leaf(LeafRecord().HasExpression(KFS_ExprFlag_Disabled), OneValue + Atom("expr", "caf\xE9"));
    TestStream stream;
    ASSERT_EQ(0, ReadLeaf(stream, Form(leaf, 71, 0, CKF_TextEncoding_Latin1.code)));
    EXPECT_EQ(Q_MBToUTF16String("caf\xC3\xA9"), KFS_GetStreamExpression(stream));
    EXPECT_FALSE(stream->HasActiveExpression());
    TestStream newer;
    EXPECT_EQ(CKF_Err_NoSuchChunk, ReadLeaf(newer, Form(leaf, 72))) << "a newer file has it elsewhere";
}

TEST_F(LeafRead, CorruptLists)
{
    std::string const record = LeafRecord().Flags(0).HasList();
    TestStream stream;
    EXPECT_EQ(21, ReadLeaf(stream, Form(Leaf(record, Keys(40, {std::string(40, 'a')})))));
    EXPECT_EQ(1u, reports.Take().size());
    EXPECT_EQ(SEQ_Err_BadChunk,
              ReadLeaf(stream, Form(Leaf(record, Atom("seql", Long(48) + Long(0x7FFFFFFF) + ScalarKey(0, 1))))));
    EXPECT_EQ(0, stream.Count());
    EXPECT_EQ(0, ReadLeaf(stream, Form(Leaf(record, Keys(48, {})))));
    ASSERT_NE(nullptr, stream->GetKeys()) << "an empty list is a list";
    EXPECT_EQ(0, stream.Count());
}

// A list may be longer than a short can say.
TEST_F(LeafRead, AllKeysAreStaleHoweverMany)
{
    std::vector<std::string> items;
    for (int i = 0; i < 70000; ++i) items.push_back(ScalarKey(i, i));
    TestStream stream;
    ASSERT_EQ(0, ReadLeaf(stream, Form(Leaf(LeafRecord().Flags(0).HasList(), Keys(48, items)))));
    EXPECT_EQ((std::array<int, 2>{0, 69999}), stream.Stale());
    EXPECT_EQ(69998.5, (stream.Key(140000, {0.0}), stream.At1(69998) + 0.5));
}

// A class whose values own something.
class OwnedLeaf : public KFS_Stream {
public:
    OwnedLeaf()
        : KFS_Stream(1, 600, 1, 0, KFS_InterpMask_All, 0,
                     {.isCustom = 1, .itemSize = sizeof(OwnedValues::Ticket), .interpFunc = OwnedValues::Interpolate},
                     nullptr, nullptr, false)
    {
        EXPECT_EQ(0, KFS_SetCustomFuncs(this, OwnedValues::Copy, OwnedValues::Dispose));
    }
};

// The stream owns what the file brings, and has given back what it had.
TEST_F(LeafRead, ValuesThatOwnSomething)
{
    for (bool const derived : {false, true}) {
        SCOPED_TRACE(derived);
        OwnedValues::Reset();
        {
            std::unique_ptr<KFS_Stream> const stream =
                derived ? std::make_unique<OwnedLeaf>() : OwnedValues::MakeStream(true);
            OwnedValues::Ticket const first = OwnedValues::Make(1.0);
            T_Time const at{0, 600};
            ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 1, &first, 0, 0));
            OwnedValues::Free(first);
            ASSERT_EQ(1, OwnedValues::Live());
            LeafRecord constant;
            constant.Put(56, Short(1)).Put(58, Short(4));
            for (bool const keyed : {false, true}) {
                OwnedValues::Ticket const ticket = OwnedValues::Make(2.0);
                std::string const data(reinterpret_cast<char const*>(&ticket), sizeof ticket);
                std::string const leaf =
                    keyed ? Leaf(LeafRecord(constant).Flags(0).HasList(), Keys(12, {KeyHead(0, 1, 1, 0) + data}))
                          : Leaf(constant, Atom("cdat", data));
                ASSERT_EQ(0, ReadLeaf(stream.get(), Form(leaf)));
                EXPECT_EQ(1, OwnedValues::Live());
            }
        }
        EXPECT_EQ(0, OwnedValues::Live());
    }
}

// A stream of any shape comes back with the same bytes and the same values at all times.
TEST_F(LeafRead, WrittenAndReadBack)
{
    std::mt19937_64 random(7);
    auto const number = [&] { return static_cast<double>(random() % 20001) / 100.0 - 100.0; };
    for (int round = 0; round < 40; ++round) {
        SCOPED_TRACE(round);
        StreamOptions options;
        options.spatial = round % 3 == 0;
        options.dimension = static_cast<short>(options.spatial ? 2 + round % 2 : 1 + round % 4);
        options.noKeys = round % 5 == 4;
        options.timeScale = 30;
        TestStream stream(options);
        int const count = options.noKeys ? 1 : static_cast<int>(random() % 8);
        for (int i = 0; i < count; ++i) {
            std::vector<double> value(static_cast<std::size_t>(options.dimension));
            std::generate(value.begin(), value.end(), number);
            stream.Key(static_cast<int>(random() % 200), value, static_cast<char>(1 + random() % 3));
        }
        if (round % 2 == 0) KFS_SetStreamExpression(stream, Text("a+b"));
        if (count > 0) stream.At(10);  // brings derived data up to date
        MemoryFile const file = Written(stream);
        TestStream other({.dimension = 4});
        ASSERT_EQ(0, ReadLeaf(other, file));
        EXPECT_EQ(file.Bytes(), Written(other).Bytes());
        for (int time = -5; count > 0 && time < 210; time += 7) EXPECT_EQ(stream.At(time), other.At(time)) << time;
        EXPECT_EQ(KFS_GetStreamExpression(stream), KFS_GetStreamExpression(other));
    }
}

TEST_F(LeafRead, Expressions)
{
    TestStream stream;
    stream.Key(0, {1.0});
    HeardRoot root;
    root.Store(stream);
    ValueListener listener;
    stream->GetExprInfoForModify().SetExpressionError(Text("broken"), 3, Text("b"));
    EXPECT_EQ(u16str(), KFS_SetStreamExpression(stream, Text("one")));
    EXPECT_FALSE(stream->GetExprInfo().HasExpressionError());
    EXPECT_EQ(Text("one"), KFS_SetStreamExpression(stream, Text("one")));
    EXPECT_EQ(2, listener.Take());
    stream->GetExprInfoForModify().SetExpressionError(Text("broken"), 3, Text("b"));
    EXPECT_EQ(0, KFS_SetStreamExprFlags(stream, 2, 0xFF));
    EXPECT_TRUE(stream->GetExprInfo().HasExpressionError());
    EXPECT_EQ(0, KFS_SetStreamExprFlags(stream, 5, 4));
    EXPECT_FALSE(stream->GetExprInfo().HasExpressionError());
    EXPECT_EQ(6u, KFS_GetStreamExprFlags(stream));
    EXPECT_EQ(2, listener.Take());
    stream->SetParent(nullptr);
}

}  // namespace
