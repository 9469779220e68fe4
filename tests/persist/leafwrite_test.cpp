#include "keystore/stream.h"

#include "frame/frame.h"
#include "frame/services/byteorder.h"
#include "keystore/paramstreams.h"
#include "overrides/streamexpression.h"
#include "persist/oldstreamid.h"
#include "tests/persist/leaffile.h"
#include "tests/support/ownedvalues.h"

#include <limits>

namespace {

using Lines = std::vector<std::string>;

class LeafWrite : public StreamTest {};

std::string HexLine(std::string const& id, std::string const& bytes)
{
    return "  " + id + ' ' + MemoryFile::Hex(Span(bytes));
}

// A constant of one double.
TestStream Constant(double value)
{
    TestStream stream({.noKeys = true});
    T_Time const at{0, 600};
    EXPECT_EQ(0, KFS_InsertKeyF(stream, &at, 1, &value, 0, 0));
    return stream;
}

void SetParam(KFS_Stream* stream, int kind)
{
    FX_ParamDef def{};
    def.paramType = kind;
    stream->SetParamDef(def);
}

TEST_F(LeafWrite, AConstantByteByByte)
{
    TestStream stream = Constant(-2.5);
    stream->SetDisplayName(Text("Gain"));
    stream->GetCache()->time = 77;
    stream->GetCache()->inInterp = 2;
    stream->GetCache()->outInterp = 3;
    stream->GetCache()->flags = 0x18;
    stream->SetSpInterpMask(9);
    stream->SetStreamBaseFlags(0xFFFFFFFF, 0xFFFFFFFB);
    LeafRecord record;
    record.Put(8, Short(9)).Put(76, "\x02\x03").Put(78, Short(0x18));
    std::vector<double> const numbers{KFSp_Numbers(stream->GetCache()), KFSp_Numbers(stream->GetCache()) + 5};
    EXPECT_EQ((Lines{"LIST kfbs", HexLine("kfsb", Long(0xFFFE2F13)), HexLine("kfsn", "Gain"), HexLine("kfb4", record),
                     HexLine("cdat", Doubles(numbers))}),
              Written(stream).Lines());
    EXPECT_EQ(-2.5, numbers[0]);
    EXPECT_EQ(-2.5, stream.At1(0)) << "what was swapped is swapped back";
}

TEST_F(LeafWrite, TheTimeOfTheLastReadOnlyWhereItIsWanted)
{
    TestStream stream = Constant(1.0);
    std::string const before = DataOf("kfb4", Written(stream));
    stream.At(3600);
    EXPECT_EQ(before, DataOf("kfb4", Written(stream)));
    MemoryFile const file = Written(stream, [](CKF_File* open) { open->SetShouldWriteModificationTimes(true); });
    EXPECT_EQ(Long(3600), DataOf("kfb4", file).substr(72, 4));
}

TEST_F(LeafWrite, AKeyedStreamByteByByte)
{
    TestStream stream({.dimension = 1, .timeScale = 30});
    stream.Key(0, {1.0}).Key(15, {2.0}, KFS_Interp_Hold);
    stream.At(7);  // leaves something in the cache record
    KFS_SetStreamExpression(stream, Text("x*2"));
    ASSERT_EQ(0, KFS_SetStreamExprFlags(stream, 0xFFFFFFFF, 0x8000000A));
    MemoryFile const file = Written(stream);
    LeafRecord record;
    record.Flags(0).Put(8, Short(KFS_InterpMask_Negative)).Put(12, Long(30)).HasList().HasExpression(0x8000000A);
    std::string items;
    for (int i = 0; i < 2; ++i) {
        KFS_KeyScalar const* const key = stream.Record(i);
        items += KeyHead(key->time, key->inInterp, key->outInterp, key->flags) + Doubles(stream.Numbers(i));
    }
    EXPECT_EQ((Lines{"LIST kfbs", HexLine("kfsb", Long(1)), "  kfsn ", HexLine("kfb4", record),
                     HexLine("seql", Long(48) + Long(2) + items), HexLine("Utf8", "x*2")}),
              file.Lines());
    EXPECT_EQ(file.Bytes(), Written(stream).Bytes());
    EXPECT_TRUE(stream.CacheIsEmpty());
}

TEST_F(LeafWrite, TheCacheFieldsOfASpatialConstant)
{
    TestStream stream({.dimension = 2, .noKeys = true, .spatial = true});
    std::vector<double> const value{3, 4};
    T_Time const at{0, 600};
    ASSERT_EQ(0, KFS_InsertKeyF(stream, &at, 1, value.data(), 0, 0));
    KFS_KeyScalar* const cache = stream->GetCache();
    cache->spFlags = 0x0A0B0C0D;
    cache->inSpeed = 1;
    cache->inInfluence = 2;
    cache->outSpeed = 3;
    cache->outInfluence = 4;
    cache->arcLength = 99;
    MemoryFile const file = Written(stream);
    EXPECT_EQ(Long(0x0A0B0C0D) + Doubles({1, 2, 3, 4}), DataOf("kfb4", file).substr(80, 36));
    std::string const data = DataOf("cdat", file);
    ASSERT_EQ(48u, data.size());
    EXPECT_EQ(Doubles(value), data.substr(0, 16));
}

TEST_F(LeafWrite, TheDescriptionOfAClientsValues)
{
    OwnedValues::Reset();
    auto const stream = OwnedValues::MakeStream(true);
    stream->GetValueDescForModify()->dataType = 0x1234;  // the client's own word
    EXPECT_EQ(Short(1) + Short(sizeof(OwnedValues::Ticket)) + std::string("\xFF\0\0\0", 4),
              DataOf("kfb4", Written(stream.get())).substr(56, 8));
}

TEST_F(LeafWrite, AListIsWrittenWhetherOrNotItIsUsed)
{
    TestStream keyed;
    EXPECT_EQ("-", DataOf("seql", Written(keyed))) << "none was made";
    keyed.Key(5, {1.0});
    ASSERT_EQ(0, KFS_RemoveKey(keyed, 0, nullptr));
    EXPECT_EQ(Long(48) + Long(0), DataOf("seql", Written(keyed)));
    keyed.Key(5, {1.0});
    keyed->SetKFSFlags(KFS_StreamFlag_NoKeys);
    MemoryFile const both = Written(keyed);
    EXPECT_EQ(40u, DataOf("cdat", both).size());
    EXPECT_EQ(56u, DataOf("seql", both).size());
}

TEST_F(LeafWrite, TextOfAnExpressionByVersion)
{
    TestStream stream = Constant(0.0);
    KFS_SetStreamExpression(stream, Q_MBToUTF16String("caf\xC3\xA9"));
    auto const inVersion = [&](int major) {
        return Written(stream, [=](CKF_File* file) { file->SetVersion(major, 0); });
    };
    EXPECT_EQ("-", DataOf("expr", inVersion(72)));
    EXPECT_EQ("caf\xC3\xA9", DataOf("Utf8", inVersion(72)));
    EXPECT_EQ("\xEF\xBB\xBF"
              "caf\xC3\xA9",
              DataOf("expr", inVersion(71)));
    EXPECT_EQ("-", DataOf("Utf8", inVersion(71)));
}

TEST_F(LeafWrite, AtomsByKindOfParameter)
{
    std::string const low = HexLine("kfum", Double(-1.5));
    std::string const high = HexLine("kfuM", Double(8.25));
    struct {
        int kind;
        Lines lines;
    } const cases[]{{FX_Param_NotFilledIn, {}},
                    {FX_Param_INT_SLIDER, {HexLine("kfum", Double(-2)), HexLine("kfuM", Double(8))}},
                    {FX_Param_FIXED_SLIDER, {low, high}},
                    {FX_Param_FIXED_ANGLE, {}},
                    {FX_Param_COLOR, {}},
                    {FX_Param_FLOAT_SLIDER, {low, high}},
                    {FX_Param_ALWAYS_SAVED, {}},
                    {FX_Param_PATH, {HexLine("kfli", Long(0xFFFFFFFE))}},
                    {FX_Param_LABEL, {}},
                    {FX_Param_POINT_3D, {}},
                    {99, {}}};
    for (auto const& c : cases) {
        SCOPED_TRACE(c.kind);
        TestStream stream = Constant(0.0);
        SetParam(stream, c.kind);
        if (c.kind == FX_Param_PATH) {
            stream->GetParamDef().value.path.pathIdentifier = 0xFFFFFFFE;
        } else if (c.kind == FX_Param_INT_SLIDER) {
            stream->GetParamDef().value.intSlider = {
                .validMin = -9, .validMax = 9, .sliderMin = -2, .sliderMax = 8, .defaultValue = 0};
        } else if (!c.lines.empty()) {
            stream->SetUIMinValue(-1.5);
            stream->SetUIMaxValue(8.25);
        }
        Lines lines = Written(stream).Lines();
        ASSERT_LE(5u, lines.size());
        lines.erase(lines.begin(), lines.begin() + 5);
        EXPECT_EQ(c.lines, lines);
    }
}

// A layer's flat number and its selector.
class LayerWrite : public StreamTest {
protected:
    LayerWrite()
    {
        KFS_AppCallbacks callbacks{};
        callbacks.layerIndependentFunc = [](KFS_ParamLayerStream const*, bool) { return 1234L; };
        callbacks.layerDefaultValueFunc = [](KFS_ParamLayerStream const*) -> void* { return nullptr; };
        KFS_SetCallbacks(callbacks);
    }
    ~LayerWrite() override { KFS_ClearCallbacks(); }
};

TEST_F(LayerWrite, SelectorsSince88Point3)
{
    KFS_ParamLayerStream stream(600, 1, nullptr, nullptr, false);
    stream.GetParamDef().value.layer.layerSelector = -2;
    struct {
        int major, minor;
        bool hasSelector;
    } const cases[] = {{87, 9, false}, {88, 0, false}, {88, 2, false}, {88, 3, true},
                       {88, 9, true},  {89, 0, true},  {95, 0, true}};
    for (auto const& c : cases) {
        SCOPED_TRACE(testing::Message() << c.major << '.' << c.minor);
        MemoryFile const file = Written(&stream, [&](CKF_File* open) { open->SetVersion(c.major, c.minor); });
        EXPECT_EQ(Long(1234), DataOf("kfpi", file));
        EXPECT_EQ(c.hasSelector ? Long(0xFFFFFFFE) : "-", DataOf("kfps", file));
        KFS_ParamLayerStream other(600, 1, nullptr, nullptr, false);
        other.GetParamDef().value.layer.layerSelector = 55;
        ASSERT_EQ(0, ReadLeaf(&other, file));
        EXPECT_EQ(c.hasSelector ? -2 : 0, other.GetParamDef().value.layer.layerSelector);
        EXPECT_EQ(Q_Int32ToPointer(1234), other.GetParamDef().value.layer.reservedPointer);
    }
}

TEST_F(LayerWrite, OnlyALayerStreamHasALayer)
{
    TestStream stream = Constant(0.0);
    SetParam(stream, FX_Param_LAYER);
    CKF_File file;
    ASSERT_EQ(0, file.CreateInMemory());
    EXPECT_EQ(3, Thrown([&] { stream->Write(&file); }));
    EXPECT_EQ((std::vector<Reported>{KfsReport(11, "stream with FX_Param_LAYER isn't a KFS_ParamLayerStream")}),
              reports.Take());
    EXPECT_NE(0, file.Commit()) << "a list is still open";
}

TEST_F(LeafWrite, KindsThatOldFilesDontKnow)
{
    CKF_File file;
    for (int kind = -1; kind < 20; ++kind) {
        TestStream stream = Constant(0.0);
        SetParam(stream, kind);
        bool const isNew = kind == FX_Param_LABEL || kind == FX_Param_POINT_3D;
        file.SetVersion(76, 9);
        EXPECT_EQ(!isNew, stream->ShouldWriteForVersion(&file)) << kind;
        file.SetVersion(77, 0);
        EXPECT_TRUE(stream->ShouldWriteForVersion(&file)) << kind;
    }
}

TEST_F(LeafWrite, ADamagedStreamIsNotWritten)
{
    DamagedStream const damaged;
    CKF_File file;
    ASSERT_EQ(0, file.CreateInMemory());
    EXPECT_EQ(2, Thrown([&] { damaged.get()->KFS_Stream::Write(&file); }));
    EXPECT_EQ((std::vector<Reported>{DamagedReport(11, "write out")}), reports.Take());
    EXPECT_EQ(0, file.Commit()) << "nothing has reached the file";
    EXPECT_TRUE(damaged.Untouched());
}

TEST_F(LeafWrite, OldStreamIds)
{
    MemoryFile const file([](CKF_File* open) {
        KFS_OldStreamID const id{{0x01020304, 0xFFFFFFFE}};
        EXPECT_EQ(0, KFS_WriteOldStreamID(&id, open));
    });
    EXPECT_EQ((Lines{"kfsi 01020304fffffffe"}), file.Lines());
    file.Read([](CKF_File* open) {
        KFS_OldStreamID id{{7, 7}};
        EXPECT_EQ(0, KFS_ReadOldStreamID(open, nullptr, &id));
        EXPECT_EQ(0x01020304u, id.words[0]);
        EXPECT_EQ(0xFFFFFFFEu, id.words[1]);
        EXPECT_EQ(CKF_Err_NoSuchChunk, KFS_ReadOldStreamID(open, nullptr, &id));
        EXPECT_EQ(0x01020304u, id.words[0]);
    });
    // More than the caller's record can hold.
    struct {
        KFS_OldStreamID id;
        unsigned int behind;
    } guarded{{{0, 0}}, 0x5A5A5A5A};
    std::string const big = Form(Atom("kfsi", std::string(40, '\x11')));
    CKF_File open;
    ASSERT_EQ(0, open.Open(Span(big)));
    EXPECT_EQ(0, KFS_ReadOldStreamID(&open, nullptr, &guarded.id));
    EXPECT_EQ(0x11111111u, guarded.id.words[1]);
    EXPECT_EQ(0x5A5A5A5Au, guarded.behind);
}

}  // namespace
