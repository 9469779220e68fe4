#include "keystore/stream.h"

#include "frame/errors.h"
#include "frame/frame.h"
#include "keystore/attributes.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/paramstreams.h"
#include "overrides/streamexpression.h"
#include "tests/persist/leaffile.h"
#include "tests/support/dice.h"
#include "tests/support/listening.h"
#include "tests/support/ownedvalues.h"

#include <climits>

namespace {

using Leaves = StreamTest;

std::string Value(std::vector<double> const& numbers)
{
    return Atom("cdat", Doubles(numbers));
}
std::string const OneValue = Value({2.5, 0, 0, 0, 0});
std::string const TwoKeys = Keys(48, {ScalarKey(0, 1.0), ScalarKey(100, 3.0)});
LeafRecord const Keyed = LeafRecord().Flags(0).HasList();

void SetParam(KFS_Stream* stream, int kind)
{
    FX_ParamDef def{};
    def.paramType = kind;
    stream->SetParamDef(def);
}

KFS_KeyScalar* KeyAt(KFS_Stream* stream, int index)
{
    void* item = nullptr;
    EXPECT_EQ(0, SEQ_GetAddress(stream->GetKeys(), index, 0, &item));
    return static_cast<KFS_KeyScalar*>(item);
}

// What a file says of a leaf, field by field.
struct ExpectedLeaf {
    static std::string ValueBytes(KFS_Stream const* stream, KFS_KeyScalar const* key)
    {
        if (stream->IsCustom())
            return {static_cast<char const*>(KFSp_ValueData(key)),
                    static_cast<std::size_t>(stream->GetValueDesc()->itemSize)};
        double const* const numbers = KFSp_Numbers(key);
        return Doubles({numbers, numbers + stream->GetDimension() * (stream->IsSpatial() ? 3 : 5)});
    }
    static std::string KeyBytes(KFS_Stream const* stream, KFS_KeyScalar const* key)
    {
        std::string bytes = KeyHead(key->time, key->inInterp, key->outInterp, key->flags);
        if (stream->IsSpatial())  // without its arc table
            bytes += Long(key->spFlags) + Long(0) +
                     Doubles({key->arcLength, key->inSpeed, key->inInfluence, key->outSpeed, key->outInfluence});
        return bytes + ValueBytes(stream, key);
    }
    static std::string Record(KFS_Stream* stream, bool writesTime)
    {
        LeafRecord record;
        KFS_ValueDesc const& desc = *stream->GetValueDesc();
        M_Vector4T<double> const& m = stream->GetMultiplier();
        record.Dimension(stream->GetDimension()).Flags(stream->GetKFSFlags()).Put(6, Short(stream->GetSpInterp()));
        record.Put(8, Short(stream->GetSpInterpMask())).Put(10, Short(stream->GetInterpMask()));
        record.Put(12, Long(stream->GetTimeScale())).Put(16, Doubles({stream->GetAccuracy(), m[0], m[1], m[2], m[3]}));
        record.Put(56, Short(stream->IsCustom())).Put(58, Short(desc.itemSize));
        record.Put(60, std::string(1, static_cast<char>(stream->IsCustom() ? 0xFF : desc.dataType)));
        if (stream->GetKeys()) record.HasList();
        if (stream->HasExpression()) record.HasExpression(KFS_GetStreamExprFlags(stream));
        if (!stream->HasNoKeys()) return record;
        KFS_KeyScalar const* const c = stream->GetCache();
        record.Put(72, KeyHead(writesTime ? c->time : 0, c->inInterp, c->outInterp, c->flags));
        if (stream->IsSpatial())
            record.Put(80, Long(c->spFlags) + Doubles({c->inSpeed, c->inInfluence, c->outSpeed, c->outInfluence}));
        return record;
    }
    static std::string Of(KFS_Stream* stream, int major, bool writesTime)
    {
        std::string text = Q_UTF16ToMBString(KFS_GetStreamExpression(stream)), rest;
        if (stream->HasNoKeys()) rest += Atom("cdat", ValueBytes(stream, stream->GetCache()));
        std::vector<std::string> items;
        for (int i = 0; stream->GetKeys() && i < (*stream->GetKeys())->count; ++i)
            items.push_back(KeyBytes(stream, KeyAt(stream, i)));
        int const size =
            (stream->IsSpatial() ? 56 : 8) + static_cast<int>(ValueBytes(stream, stream->GetCache()).size());
        if (stream->GetKeys()) rest += Keys(size, items);
        if (!text.empty())
            rest += major < 72 ? Atom("expr", (text[0] == 'c' ? "\xEF\xBB\xBF" : "") + text) : Atom("Utf8", text);
        FX_ParamDef const& def = stream->GetParamDef();
        if (def.paramType == FX_Param_PATH) rest += Atom("kfli", Long(def.value.path.pathIdentifier));
        if (def.paramType == FX_Param_INT_SLIDER || def.paramType == FX_Param_FIXED_SLIDER ||
            def.paramType == FX_Param_FLOAT_SLIDER)
            rest += Atom("kfum", Double(stream->GetUIMinValue())) + Atom("kfuM", Double(stream->GetUIMaxValue()));
        std::string const name = Q_UTF16ToMBString(stream->GetDisplayName());
        return List("kfbs", Atom("kfsb", Long(stream->GetStreamBaseFlags() & 0xFFFE2F13)) + Atom("kfsn", name) +
                                Atom("kfb4", Record(stream, writesTime)) + rest);
    }
};

// A leaf of any shape, with any bits in its fields, its cache record and its keys.
std::unique_ptr<KFS_Stream> RandomLeaf(Dice& dice)
{
    bool const spatial = dice.Below(2), custom = dice.Below(4) == 0, noKeys = dice.Below(3) == 0;
    auto const dimension = static_cast<short>(custom ? 1 : 1 + dice.Below(4));
    KFS_ValueDesc desc;
    desc.dataType = static_cast<unsigned short>(custom ? dice.Bits() : dice.Below(KFS_Type_Double + 1));
    desc.isCustom = custom;
    desc.itemSize = static_cast<unsigned short>(custom ? 1 + dice.Below(9) : 0);
    auto stream = std::make_unique<KFS_Stream>(dimension, 24, noKeys, spatial, KFS_InterpMask_All, 0, desc, nullptr,
                                               nullptr, false);
    auto const number = [&] { return std::bit_cast<double>(dice.Bits()); };
    auto const scribble = [&](KFS_KeyScalar* key) {
        key->inInterp = static_cast<signed char>(dice.Bits());
        key->outInterp = static_cast<signed char>(dice.Bits());
        key->flags = static_cast<unsigned short>((dice.Bits() & 0xFFFE) | (spatial ? KFS_KeyFlag_SpatialBlock : 0));
        auto* const value = static_cast<unsigned char*>(KFSp_ValueData(key));
        int const size = KFS_GetKeyScalarDataSize(stream->GetValueDesc(), spatial, dimension);
        for (int i = 0; i < size; ++i) value[i] = static_cast<unsigned char>(dice.Bits());
        if (!spatial) return;
        key->spFlags = static_cast<unsigned int>(dice.Bits());
        for (double* const field : {&key->inSpeed, &key->inInfluence, &key->outSpeed, &key->outInfluence})
            *field = number();
    };
    stream->SetKFSFlags(static_cast<unsigned short>(stream->GetKFSFlags() ^ (dice.Bits() & 0xFFFC)));
    stream->SetSpInterp(static_cast<unsigned short>(dice.Bits()));
    stream->SetSpInterpMask(static_cast<unsigned short>(dice.Bits()));
    stream->SetInterpMask(static_cast<unsigned short>(dice.Bits() | 1));
    stream->SetAccuracy(number());
    for (int i = 0; i < 4; ++i) (*stream->GetMultiplierForModify())[i] = number();
    stream->GetCache()->time = dice.Below(1000);
    scribble(stream->GetCache());
    if (dice.Below(8) != 0 && (!noKeys || dice.Below(4) == 0)) {  // a constant may have a list of keys, too
        int const count = dice.Below(7);
        EXPECT_EQ(0, KFSp_CreateKeyList(stream.get()));
        EXPECT_EQ(0, SEQ_SetNumItems(count, stream->GetKeys(), 0));
        for (int i = 0; i < count; ++i) {
            scribble(KeyAt(stream.get(), i));
            // Times in no order, all the same, and at both ends of what an int can be.
            static constexpr int Times[] = {INT_MAX, INT_MIN, 5, 5, 5, 0, -1, 100, INT_MIN};
            KeyAt(stream.get(), i)->time = dice.Below(2) ? 10 * i - 30 : Times[dice.Below(std::size(Times))];
            if (spatial) KeyAt(stream.get(), i)->arcLength = number();
        }
    }
    static constexpr char const* Texts[] = {"", "x*2", "caf\xC3\xA9"};
    KFS_SetStreamExpression(stream.get(), Q_MBToUTF16String(Texts[dice.Below(3)]));
    auto const exprFlags = static_cast<unsigned int>(stream->HasExpression() ? dice.Bits() : 0);
    EXPECT_EQ(0, KFS_SetStreamExprFlags(stream.get(), 0xFFFFFFFF, exprFlags));
    stream->SetDisplayName(Text(dice.Below(2) ? "" : "Gain"));
    // Not canonical; and a name that is read takes back that it was compared.
    stream->SetStreamBaseFlags(static_cast<unsigned int>(dice.Bits()), 0xFFFBFFFB);
    return stream;
}

TEST_F(Leaves, AreInFilesFieldByFieldAndComeBack)
{
    Dice dice(7);
    for (int round = 0; round < Rounds(400); ++round) {
        SCOPED_TRACE(round);
        auto const stream = RandomLeaf(dice);
        int const kind = round % 21 == 0 ? 99 : round % 21, major = round % 5 == 0 ? 71 : 72 + round % 9;
        bool const writesTime = round % 2 == 0;
        TestStream other({.dimension = 4});
        other.Key(3, {1, 2, 3, 4}).Key(9, {4, 5, 6, 7});  // all of it is replaced
        for (KFS_Stream* const each : {stream.get(), other.get()}) SetParam(each, kind);
        stream->SetUIMinValue(-2);
        stream->SetUIMaxValue(8);
        if (kind == FX_Param_PATH) stream->GetParamDef().value.path.pathIdentifier = 0xFFFFFFFE;
        SEQ_Head** const keys = stream->GetKeys();
        int const count = keys ? (*keys)->count : 0;
        bool const hasArcs = stream->IsSpatial() && count > 0;
        if (hasArcs) KeyAt(stream.get(), 0)->remapTable = keys;  // any pointer, which isn't looked at
        auto const write = [&](KFS_Stream* each) {
            return Written(each, [&](CKF_File* file) {
                file->SetVersion(major, 0);
                file->SetShouldWriteModificationTimes(writesTime);
            });
        };
        MemoryFile const file = write(stream.get());
        EXPECT_EQ(file.Bytes(), write(stream.get()).Bytes()) << "what was swapped is swapped back";
        if (hasArcs) KeyAt(stream.get(), 0)->remapTable = nullptr;
        std::string const expected =
            Form(ExpectedLeaf::Of(stream.get(), major, writesTime), static_cast<std::uint32_t>(major));
        CKF_File made;
        ASSERT_EQ(0, made.Open(Span(expected)));
        EXPECT_EQ(MemoryFile::LinesOf(Span(expected)), file.Lines());
        ASSERT_EQ(0, ReadLeaf(other, file));
        EXPECT_EQ(file.Lines(), write(other).Lines());
        EXPECT_EQ(keys == nullptr, other->GetKeys() == nullptr) << "an empty list is a list";
        EXPECT_EQ(0, other.Pins());
        auto const stale = other->GetKeyCount() > 0 ? std::array{0, other->GetKeyCount() - 1} : TestStream::NotStale;
        EXPECT_TRUE(other.Stale() == stale && other.ArcStale() == stale);
        for (int i = 0; other->IsSpatial() && i < other.Count(); ++i) EXPECT_EQ(nullptr, other.Record(i)->remapTable);
        EXPECT_TRUE(other->HasNoKeys() || other.CacheIsEmpty());
        // However little sense it makes, it can be used.
        for (int const time : {INT_MIN + 1, -7, 5, 50, INT_MAX}) {
            double value[32];
            T_Time const at = other.Time(time);
            if (!other->IsCustom()) static_cast<void>(KFS_GetValueFPlus(other, &at, 0, value, nullptr, nullptr));
        }
        static_cast<void>(KFS_RescaleStream(other, 24000));
        reports.Take();
    }
}

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

Reported CorruptKeys(int severity, std::string const& text)
{
    return {0x1D0077, severity, "The project file is corrupt. Stored keyframes " + text, 0};
}
Reported const TooSmall = CorruptKeys(4, "are missing data.");
Reported const TooBig =
    CorruptKeys(8, "do not match the property type. Attempting to read the keyframes by truncating the values.");

// What no stream can be is refused before the stream is touched. Memory is in proportion to the file: nothing is made for
// what a file only claims.
TEST_F(Leaves, AreRefused)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    auto const expectRefused = [&](int code, std::vector<Reported> const& told, bool isUntouched,
                                   std::string const& leaf) {
        SCOPED_TRACE(MemoryFile::Hex(Span(leaf)));
        TestStream stream({.dimension = 2});
        stream.Key(0, {1, 2}).Key(10, {3, 4});
        EXPECT_EQ(code, ReadLeaf(stream, Form(leaf)));
        EXPECT_EQ(told, reports.Take());
        EXPECT_TRUE(isUntouched ? stream.At(5) == std::vector<double>({2, 3}) : stream.Count() == 0);
        EXPECT_GT(8192, Q_MemoryLive(nullptr).bytes - before.bytes);
    };
    std::string const record = LeafRecord();
    for (std::string const& wrong :
         {Atom("kfb3", record), Atom("cdat", record) + Atom("kfb4", record), List("kfb4", record)})
        expectRefused(KFS_Err_BadFileInfo,
                      {KfsReport(12, "invalid time stream information in file (unrecognized chunk ID).")}, true,
                      List("kfbs", Base() + wrong));
    expectRefused(CKF_Err_NoSuchChunk, {}, true, List("kfbs", Base()));
    expectRefused(CKF_Err_NoSuchChunk, {}, true, List("kfgp", Base()));
    expectRefused(CKF_Err_NoSuchChunk, {}, false, Leaf(record, ""));
    expectRefused(CKF_Err_NoSuchChunk, {}, false, Leaf(Keyed, OneValue));
    for (LeafRecord const& bad :
         {LeafRecord().Dimension(-1), LeafRecord().Dimension(32767), LeafRecord().Dimension(819),
          LeafRecord().Put(60, "\x0A"), LeafRecord().Dimension(1365).Flags(3),
          LeafRecord().Put(56, Short(1)).Put(58, Short(0xFFFF))})
        expectRefused(KFS_Err_BadValueDesc, {}, true, Leaf(bad, OneValue));
    LeafRecord const spatial = LeafRecord(Keyed).Dimension(2).Flags(KFS_StreamFlag_Spatial);
    expectRefused(21, {TooSmall}, false, Leaf(Keyed, Keys(47, {std::string(47, 'a')})));
    expectRefused(21, {TooSmall}, false, Leaf(spatial, Keys(103, {std::string(103, 'a')})));
    for (std::string const& claim :
         {Long(48) + Long(0x7FFFFFFF) + ScalarKey(0, 1), Long(1) + Long(0x7FFFFFFF), Long(32767) + Long(0x10001),
          Long(48) + Long(0xFFFFFFFF), Long(0) + Long(5), Long(0x10030) + Long(1) + std::string(48, '\0')})
        expectRefused(SEQ_Err_BadChunk, {}, false, Leaf(Keyed, Atom("seql", claim)));
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
    KFS_MatchName const name("@1 knob", true);
    FixedLeaf derived(2, &name);
    EXPECT_EQ(KFS_Err_BadFileInfo, ReadLeaf(&derived, Form(Leaf(LeafRecord().Dimension(-3), OneValue))));
    EXPECT_EQ((std::vector<Reported>{
                  {0x1D000C, 4, "property of type \"@1 knob\" had dimension -3 in file, but we expected 2", 0}}),
              reports.Take());
    EXPECT_EQ(42.0, derived.Value());
}

// A short record ends in zeros; of a long one the front counts.
TEST_F(Leaves, HaveRecordsOfOtherLengths)
{
    std::string const record = LeafRecord().HasExpression(0x80000006).Bytes() + std::string(33, 'x');
    for (std::size_t const size : {12u, 16u, 60u, 61u, 72u, 119u, 157u}) {
        SCOPED_TRACE(size);
        TestStream stream;
        ASSERT_EQ(0, ReadLeaf(stream, Form(Leaf(record.substr(0, size), OneValue + Atom("Utf8", "wiggle")))));
        EXPECT_EQ(1, stream->GetDimension());
        EXPECT_EQ(size < 16 ? 0u : 600u, stream->GetTimeScale());
        EXPECT_EQ(size < 61 ? KFS_Type_S8 : KFS_Type_Double, stream->GetValueDesc()->dataType & 0xFF);
        EXPECT_EQ(Text(size < 121 ? "" : "wiggle"), KFS_GetStreamExpression(stream));
        EXPECT_TRUE(!stream->HasExpression() || KFS_GetStreamExprFlags(stream) == 0x80000006);
        EXPECT_TRUE(size < 16 || stream.At1(0) == 2.5);
    }
}

// A stream whose values are pointers, which mean nothing in a file.
class PointerStream : public KFS_Stream {
public:
    explicit PointerStream(bool spatial)
        : KFS_Stream(1, 600, 0, spatial, KFS_InterpMask_All, 0, {.isCustom = 1, .itemSize = 8}, nullptr, nullptr, false)
    {}
    bool IsCustomValuePointer() const override { return true; }
};

// Keys that hold more are cut at a byte, never read beyond their item, and have the stream's layout whatever their flag
// says: it could make numbers pass for an arc table, which somebody would then dispose.
TEST_F(Leaves, HaveKeysOfOtherSizes)
{
    std::string const head = Long(0) + Long(0xFFFFFFFF) + Doubles({1, 2, 3, 4, 5});
    struct {
        int dimension;
        std::string key;
        unsigned short flags;
        std::vector<double> numbers;
        std::vector<Reported> reports;
    } const rows[] = {
        {1, KeyHead(7, 1, 1, 0xFFFF) + Doubles({1, 2, 3, 4, 5}), 0xFFFE, {1, 2, 3, 4, 5}, {}},
        {1, KeyHead(7, 1, 1, 0) + Doubles({1, 2, 3, 4, 5, 6, 7, 8, 9, 10}), 0, {1, 2, 3, 4, 5}, {TooBig}},
        {2, KeyHead(7, 1, 1, 1) + head + Doubles({10, 11, 12, 13, 14, 15}), 1, {10, 11, 12, 13, 14, 15}, {}},
        {2,
         KeyHead(7, 1, 1, 0) + head + Doubles({10, 11, 12, 13, 14, 15}) + std::string(400, '\xEE'),
         1,
         {10, 11, 12, 13, 14, 15},
         {TooBig}},
    };
    for (auto const& row : rows) {
        TestStream stream;
        LeafRecord const record = LeafRecord(Keyed).Dimension(row.dimension).Flags(row.dimension == 2 ? 2 : 0);
        ASSERT_EQ(0, ReadLeaf(stream, Form(Leaf(record, Keys(static_cast<int>(row.key.size()), {row.key, row.key})))));
        EXPECT_EQ(row.reports, reports.Take());
        EXPECT_EQ(2, stream.Count());
        for (int i = 0; i < stream.Count(); ++i) {
            EXPECT_EQ(row.flags, stream.Record(i)->flags);
            EXPECT_EQ(row.numbers, stream.Numbers(i));
            EXPECT_TRUE(row.dimension == 1 || !stream.Record(i)->remapTable);
        }
    }
    for (bool const spatial : {false, true}) {
        for (int const size : {1, 8, 10, 57, 100}) {
            SCOPED_TRACE(testing::Message() << spatial << ' ' << size);
            PointerStream stream(spatial);
            std::string const item(static_cast<std::size_t>(size), '\x01');
            LeafRecord const record = LeafRecord(Keyed).Flags(spatial ? KFS_StreamFlag_Spatial : 0);
            ASSERT_EQ(0, ReadLeaf(&stream, Form(Leaf(record, Keys(size, {item, item})))));
            EXPECT_EQ(size < 4 ? 0x01000000 : 0x01010101, KeyAt(&stream, 1)->time);
            EXPECT_EQ(size > (spatial ? 76 : 16) ? 1u : 0u, reports.Take().size());
        }
    }
}

// A class of its own keeps its dimension, what its values are and whether it is spatial: with another layout of records
// than the class has it takes its default, and the file's expression. One that doesn't animate becomes constant.
TEST_F(Leaves, OfAClassOfTheirOwn)
{
    LeafRecord const constant = LeafRecord().HasExpression().Put(60, "\x02").Put(8, Short(77)).Put(12, Long(25));
    LeafRecord const keyed = LeafRecord(Keyed).HasExpression();
    auto const spatial = [](LeafRecord record, unsigned flags) { return record.Flags(KFS_StreamFlag_Spatial | flags); };
    struct {
        LeafRecord record;
        std::string rest;
        bool canBeAnimated;
        int kind, count;
        double value;
    } const rows[] = {
        {constant, OneValue, true, -1, 0, 2.5},
        {spatial(constant, KFS_StreamFlag_NoKeys), Value({1, 2, 3}), true, -1, 0, 42.0},
        {spatial(keyed, 0), Keys(80, {std::string(80, '\x11')}), true, -1, 0, 42.0},
        {keyed, TwoKeys, true, -1, 2, 1.0},
        {keyed, TwoKeys, true, FX_Param_COLOR, 2, 1.0},
        {keyed, TwoKeys, true, FX_Param_ALWAYS_SAVED, 2, 1.0},
        {keyed, TwoKeys, false, -1, 0, 1.0},
        {keyed, TwoKeys, false, FX_Param_COLOR, 0, 1.0},
        {keyed, TwoKeys, false, FX_Param_ALWAYS_SAVED, 2, 1.0},
    };
    for (auto const& row : rows) {
        SCOPED_TRACE(&row - rows);
        FixedLeaf stream;
        stream.GetCache()->time = 5;
        stream.canBeAnimated = row.canBeAnimated;
        SetParam(&stream, row.kind);
        ASSERT_EQ(0, ReadLeaf(&stream, Form(Leaf(row.record, row.rest + Atom("Utf8", "time")))));
        EXPECT_EQ(Text("time"), KFS_GetStreamExpression(&stream));
        KFS_SetStreamExpression(&stream, u16str());
        EXPECT_FALSE(stream.IsSpatial());
        EXPECT_EQ(row.count == 0, stream.HasNoKeys());
        EXPECT_EQ(row.count, stream.Count());
        EXPECT_EQ(row.value, stream.Value());
        EXPECT_EQ(KFS_Type_Double, stream.GetValueDesc()->dataType & 0xFF);
        EXPECT_EQ(0, stream.GetSpInterpMask());
        EXPECT_EQ(row.record.Bytes().substr(12, 4), Long(stream.GetTimeScale()));
    }
    // The value of a constant that the file turns into keys is gone, also where there is no key.
    for (bool const hasList : {false, true}) {
        FixedLeaf stream;
        ASSERT_EQ(0, ReadLeaf(&stream, Form(hasList ? Leaf(Keyed, Keys(48, {})) : Leaf(LeafRecord().Flags(0), ""))));
        EXPECT_EQ(KFS_INVALID_INDEX, stream.GetCache()->time);
        EXPECT_TRUE(stream.HasNoValue());
    }
}

// One whose flag says so isn't read, and its chunk is still there. Who has entered the list itself passes it.
TEST_F(Leaves, AreTakenFromWhereTheFileStands)
{
    std::string const file = Form(Leaf(LeafRecord(), Atom("what", "?") + OneValue) + Atom("next", "abcd"));
    for (bool const hasEntered : {false, true}) {
        FixedLeaf stream;
        CKF_File open;
        ASSERT_EQ(0, open.Open(Span(file)));
        stream.SetStreamBaseFlags(KFS_BaseFlag_SkipLeafRead, KFS_BaseFlag_SkipLeafRead);
        EXPECT_EQ(0, Thrown([&] { stream.Read(&open, nullptr); }));
        EXPECT_EQ(42.0, stream.Value());
        stream.SetStreamBaseFlags(0, KFS_BaseFlag_SkipLeafRead);
        if (hasEntered) {
            CKF_ScDescendList const list(&open, CKF_Id("kfbs"), nullptr, nullptr);
            EXPECT_EQ(0, Thrown([&] { stream.Read(&open, list.GetChunkInfo()); }));
        } else {
            EXPECT_EQ(0, Thrown([&] { stream.Read(&open, nullptr); }));
        }
        EXPECT_EQ(2.5, stream.Value());
        EXPECT_EQ("next:4", Outline(&open));
    }
}

// What a kind of parameter has beside its value: sliders a range, or their limits where the file has none; a path its
// number. A flag of the stream hides these, but the file's own counts for the next read only.
TEST_F(Leaves, OfKindsOfParameters)
{
    struct {
        double low, high, expectedLow, expectedHigh;
        std::uint32_t major;
        unsigned flagsBefore, flagsInFile;
    } const rows[] = {{-1, 7, -1, 7, 95, 0, 0},
                      {0, 0, -10, 10, 95, 0, 0},
                      {0, 1, 0, 1, 95, 0, 0},
                      {-1, 7, -1, 7, 61, 0, 0},
                      {-1, 7, 3, 4, 60, 0, 0},
                      {-1, 7, 3, 4, 95, KFS_BaseFlag_Reserved8, 0},
                      {-1, 7, -1, 7, 95, 0, KFS_BaseFlag_Reserved8}};
    for (auto const& row : rows) {
        SCOPED_TRACE(&row - rows);
        FixedLeaf stream;
        SetParam(&stream, FX_Param_FLOAT_SLIDER);
        stream.GetParamDef().value.floatSlider.validMin = -10;
        stream.GetParamDef().value.floatSlider.validMax = 10;
        stream.GetParamDef().value.floatSlider.sliderMin = 3;
        stream.GetParamDef().value.floatSlider.sliderMax = 4;
        stream.SetStreamBaseFlags(row.flagsBefore, KFS_BaseFlag_Reserved8);
        std::string const range = Atom("kfum", Double(row.low)) + Atom("kfuM", Double(row.high));
        std::string const file = List("kfbs", Base(row.flagsInFile) + Atom("kfb4", LeafRecord()) + OneValue + range);
        ASSERT_EQ(0, ReadLeaf(&stream, Form(file, row.major)));
        EXPECT_EQ(row.expectedLow, stream.GetUIMinValue());
        EXPECT_EQ(row.expectedHigh, stream.GetUIMaxValue());
        EXPECT_EQ(row.flagsInFile, stream.GetStreamBaseFlags());
    }
    CKF_File file;
    for (int kind = -1; kind < 20; ++kind) {
        TestStream stream;
        SetParam(stream, kind);
        bool const isNew = kind == FX_Param_LABEL || kind == FX_Param_POINT_3D;
        file.SetVersion(76, 9);
        EXPECT_EQ(!isNew, stream->ShouldWriteForVersion(&file)) << kind;
        file.SetVersion(77, 0);
        EXPECT_TRUE(stream->ShouldWriteForVersion(&file)) << kind;
    }
}

// A layer's flat number, and since 88.3 its selector.
TEST_F(Leaves, OfLayers)
{
    KFS_AppCallbacks callbacks{};
    callbacks.layerIndependentFunc = [](KFS_ParamLayerStream const*, bool) { return 1234L; };
    callbacks.layerDefaultValueFunc = [](KFS_ParamLayerStream const*) -> void* { return nullptr; };
    KFS_SetCallbacks(callbacks);
    KFS_ParamLayerStream stream(600, 1, nullptr, nullptr, false), other(600, 1, nullptr, nullptr, false);
    stream.GetParamDef().value.layer.layerSelector = -2;
    for (auto const& [major, minor] : {std::pair{87, 9}, {88, 0}, {88, 2}, {88, 3}, {88, 9}, {89, 0}, {95, 0}}) {
        SCOPED_TRACE(testing::Message() << major << '.' << minor);
        bool const hasSelector = major > 88 || (major == 88 && minor >= 3);
        MemoryFile const file = Written(&stream, [&](CKF_File* open) { open->SetVersion(major, minor); });
        EXPECT_EQ(Long(1234), DataOf("kfpi", file));
        EXPECT_EQ(hasSelector ? Long(0xFFFFFFFE) : "-", DataOf("kfps", file));
        other.GetParamDef().value.layer.layerSelector = 55;
        ASSERT_EQ(0, ReadLeaf(&other, file));
        EXPECT_EQ(hasSelector ? -2 : 0, other.GetParamDef().value.layer.layerSelector);
        EXPECT_EQ(Q_Int32ToPointer(1234), other.GetParamDef().value.layer.reservedPointer);
    }
    KFS_ClearCallbacks();
}

TEST_F(Leaves, ThatCannotBeWritten)
{
    TestStream layerless({.noKeys = true});
    SetParam(layerless, FX_Param_LAYER);
    DamagedStream const damaged;
    struct {
        KFS_Stream* stream;
        int code;
        Reported report;
        bool hasBegun;  // a list is still open
    } const rows[] = {
        {layerless, 3, KfsReport(11, "stream with FX_Param_LAYER isn't a KFS_ParamLayerStream"), true},
        {damaged.get(), 2, DamagedReport(11, "write out"), false},
    };
    for (auto const& row : rows) {
        CKF_File file;
        ASSERT_EQ(0, file.CreateInMemory());
        EXPECT_EQ(row.code, Thrown([&] { row.stream->KFS_Stream::Write(&file); }));
        EXPECT_EQ(std::vector<Reported>{row.report}, reports.Take());
        EXPECT_EQ(row.hasBegun, file.Commit() != 0);
    }
    EXPECT_TRUE(damaged.Untouched());
}

TEST_F(Leaves, ExpressionsOfOldFilesAreInTheirEncoding)
{
    std::string const leaf =
        Leaf(LeafRecord().HasExpression(KFS_ExprFlag_Disabled), OneValue + Atom("expr", "caf\xE9"));
    TestStream stream, newer;
    ASSERT_EQ(0, ReadLeaf(stream, Form(leaf, 71, 0, CKF_TextEncoding_Latin1.code)));
    EXPECT_EQ(Q_MBToUTF16String("caf\xC3\xA9"), KFS_GetStreamExpression(stream));
    EXPECT_FALSE(stream->HasActiveExpression());
    EXPECT_EQ(CKF_Err_NoSuchChunk, ReadLeaf(newer, Form(leaf, 72))) << "a newer file has it elsewhere";
}

// A list may be longer than a short can say.
TEST_F(Leaves, AllKeysAreStaleHoweverMany)
{
    std::vector<std::string> items;
    for (int i = 0; i < 70000; ++i) items.push_back(ScalarKey(i, i));
    TestStream stream;
    ASSERT_EQ(0, ReadLeaf(stream, Form(Leaf(Keyed, Keys(48, items)))));
    EXPECT_EQ((std::array<int, 2>{0, 69999}), stream.Stale());
    EXPECT_EQ(69998.0, (stream.Key(140000, {0.0}), stream.At1(69998)));
}

// A class whose values own something. As pointers they aren't in files, and a null one is nobody's.
class OwnedLeaf : public KFS_Stream {
public:
    explicit OwnedLeaf(bool pointers = false, bool hasDefault = false)
        : KFS_Stream(1, 600, 1, 0, KFS_InterpMask_All, 0,
                     {.isCustom = 1, .itemSize = sizeof(OwnedValues::Ticket), .interpFunc = OwnedValues::Interpolate},
                     nullptr, nullptr, false),
          pointers_(pointers),
          hasDefault_(hasDefault)
    {
        EXPECT_EQ(0, KFS_SetCustomFuncs(this, CopyOrNull, DisposeUnlessNull));
    }
    bool IsCustomValuePointer() const override { return pointers_; }
    void InsertDefaultKey(T_Time const& time) override
    {
        if (hasDefault_) Insert(this, time.value, 7.0);
    }
    static void Insert(KFS_Stream* stream, int time, double value)
    {
        T_Time const at{time, 600};
        OwnedValues::Ticket const mine = OwnedValues::Make(value);
        EXPECT_EQ(0, KFS_InsertKey(stream, &at, 1, &mine, KFS_Interp_Hold, KFS_Interp_Hold));
        OwnedValues::Free(mine);
    }

private:
    static bool IsNull(void const* block)
    {
        int number;
        std::memcpy(&number, block, sizeof number);
        return number == 0;
    }
    static int CopyOrNull(KFS_Stream const* stream, long refcon, short kind, void const* source, void* destination)
    {
        if (!IsNull(source)) return OwnedValues::Copy(stream, refcon, kind, source, destination);
        std::memset(destination, 0, sizeof(OwnedValues::Ticket));
        return 0;
    }
    static int DisposeUnlessNull(KFS_Stream const* stream, long refcon, short kind, void* block)
    {
        return IsNull(block) ? 0 : OwnedValues::Dispose(stream, refcon, kind, block);
    }

    bool pointers_;
    bool hasDefault_;
};

// A file's leaf with that custom value: a constant, or two keys.
std::string OwnedInFile(bool keyed, int number, int constantTime = 0)
{
    std::string data(sizeof number, '\0');
    std::memcpy(data.data(), &number, sizeof number);
    LeafRecord record;
    record.Put(56, Short(1)).Put(58, Short(4)).Put(72, Long(static_cast<unsigned>(constantTime)));
    if (!keyed) return Form(Leaf(record, Atom("cdat", data)));
    return Form(Leaf(record.Flags(0).HasList(), Keys(12, {KeyHead(0, 1, 1, 0) + data, KeyHead(9, 1, 1, 0) + data})));
}

// The stream owns what the file brings, and has given back what it had.
TEST_F(Leaves, WhoseValuesOwnSomething)
{
    for (bool const derived : {false, true}) {
        SCOPED_TRACE(derived);
        OwnedValues::Scope const scope;
        auto const stream = derived ? std::make_unique<OwnedLeaf>() : OwnedValues::MakeStream(true);
        OwnedValues::InsertKey(stream.get(), 0, 1.0);
        LeafRecord const constant = LeafRecord().Put(56, Short(1)).Put(58, Short(4));
        for (bool const keyed : {false, true}) {
            OwnedValues::Ticket const ticket = OwnedValues::Make(2.0);
            std::string const data(reinterpret_cast<char const*>(&ticket), sizeof ticket);
            std::string const leaf =
                keyed ? Leaf(LeafRecord(constant).Flags(0).HasList(), Keys(12, {KeyHead(0, 1, 1, 0) + data}))
                      : Leaf(constant, Atom("cdat", data));
            ASSERT_EQ(0, ReadLeaf(stream.get(), Form(leaf)));
            EXPECT_EQ(1, OwnedValues::Live());
            EXPECT_EQ(2.0, OwnedValues::Read(stream.get(), 0));
        }
        if (derived) continue;
        // What the client's functions can't take is refused before the stream is touched.
        for (LeafRecord const& other : {LeafRecord(), LeafRecord().Put(56, Short(1)).Put(58, Short(1))})
            EXPECT_EQ(KFS_Err_BadValueDesc, ReadLeaf(stream.get(), Form(Leaf(other, OneValue))));
        EXPECT_EQ(2.0, OwnedValues::Read(stream.get(), 0));
    }
}

// A pointer from a file reaches nobody, and none is made up: what a client is handed it has made, or it is null.
TEST_F(Leaves, WhosePointersAreNotInFiles)
{
    constexpr int FromAnotherRun = 0x41414141;
    struct {
        bool wasKeyed, hadValue, hasDefault, keyedFile;
        int fileTime;
        double expected;  // the value then, -1 for none
    } const cases[] = {{false, true, false, false, 5, 1.0},   {false, true, true, false, KFS_INVALID_INDEX, -1.0},
                       {false, false, false, false, 0, -1.0}, {false, false, true, false, 0, 7.0},
                       {true, true, false, false, 0, -1.0},   {true, true, true, false, 0, 7.0},
                       {false, true, true, true, 0, 0.0},     {true, true, true, true, 0, 0.0}};
    for (auto const& c : cases) {
        SCOPED_TRACE(testing::Message() << c.wasKeyed << c.hadValue << c.hasDefault << c.keyedFile << c.fileTime);
        OwnedValues::Scope const owned;
        OwnedLeaf stream(true, c.hasDefault);
        OwnedLeaf::Insert(&stream, 0, 1.0);  // a record whose value has been given back keeps its bytes
        if (c.wasKeyed) {
            ASSERT_EQ(0, stream.SetConstant(false, true));
            EXPECT_EQ(1.0, OwnedValues::Read(&stream, 3));
        } else if (!c.hadValue) {
            OwnedValues::RemoveKey(&stream, 0);
        }
        ASSERT_EQ(0, ReadLeaf(&stream, OwnedInFile(c.keyedFile, FromAnotherRun, c.fileTime)));
        int const live = OwnedValues::Live();
        EXPECT_EQ(c.expected > 0 ? 1 : 0, live);
        EXPECT_EQ(c.expected < 0, stream.HasNoValue());
        if (c.expected > 0) EXPECT_EQ(c.expected, OwnedValues::Read(&stream, c.fileTime));
        if (c.keyedFile) {
            OwnedLeaf::Insert(&stream, 9, 3.0);  // as its class would
            EXPECT_EQ(3.0, OwnedValues::Read(&stream, 9));
            MemoryFile const file = Written(&stream);
            EXPECT_NE(std::string::npos, std::string(file.Bytes().begin(), file.Bytes().end())
                                             .find(KeyHead(9, KFS_Interp_Hold, KFS_Interp_Hold, 0) + Long(0)));
        }
    }
}

// Which change the stream, and forget the error of the expression before, unless its flags stay.
TEST_F(Leaves, HaveExpressions)
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
