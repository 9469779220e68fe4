#include "keystore/copykeys.h"

#include "curves/floatkeys.h"
#include "keystore/edit.h"
#include "tests/support/listening.h"
#include "tests/support/ownedvalues.h"
#include "tests/support/streams.h"

namespace {

class CopyKeys : public StreamTest {};

// A list of key indices, as a caller hands them over.
class IndexList {
public:
    explicit IndexList(std::vector<int> const& indices)
    {
        EXPECT_EQ(0, SEQ_New(0, sizeof(int), 4, 1, &list_));
        for (int const index : indices) EXPECT_EQ(0, SEQ_Insert(&index, -1, list_));
    }
    ~IndexList() { EXPECT_EQ(0, SEQ_Dispose(list_, 0)); }
    IndexList(IndexList const&) = delete;
    IndexList& operator=(IndexList const&) = delete;
    operator SEQ_Head**() const { return list_; }

private:
    SEQ_Head** list_ = nullptr;
};

// A destination that may refuse a foreign value.
class PickyStream : public KFS_Stream {
public:
    PickyStream(KFS_ValueDesc const& desc, bool noKeys)
        : KFS_Stream(1, 600, noKeys, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false)
    {}
    void PrepareForInsertOfForeignValue(KFS_Stream const* source) override
    {
        asked = source;
        if (refusal != 0) throw int{refusal};
    }
    KFS_Stream const* asked = nullptr;
    int refusal = 0;
};

TEST_F(CopyKeys, TheDestinationPreparesAndMayRefuse)
{
    for (bool const noKeys : {false, true}) {
        KFS_ValueDesc desc;
        desc.dataType = KFS_Type_Double;
        PickyStream destination(desc, noKeys);
        TestStream source;
        source.Key(10, {1}).Key(20, {2});
        ASSERT_EQ(0, KFS_CopyKey(source, 0, 1, nullptr, &destination, nullptr));
        EXPECT_EQ(source.get(), destination.asked);
        destination.refusal = 4711;
        int index = 77;
        EXPECT_EQ(4711, KFS_CopyKey(source, 1, 1, nullptr, &destination, &index));
        EXPECT_EQ(KFS_INVALID_INDEX, index);
        double value = 0.0;
        ASSERT_EQ(0, KFS_RemoveKey(&destination, 0, &value));
        EXPECT_EQ(1.0, value) << "what was there is there still";
    }
}

TEST_F(CopyKeys, RecordsOfAnotherSizeAreTakenAsFarAsTheyGo)
{
    struct Row {
        StreamOptions source, destination;
    } const rows[] = {
        {{.dimension = 1}, {.dimension = 2}},
        {{.dimension = 2}, {.dimension = 1}},
        {{.dimension = 2, .spatial = true}, {.dimension = 2}},
        {{.dimension = 2}, {.dimension = 2, .spatial = true, .spInterpMask = 0}},
    };
    for (Row const& row : rows) {
        TestStream source(row.source);
        source.Key(10, {1.0, 1.5}).Key(20, {2.0, 2.5});
        TestStream one(row.destination), all(row.destination);
        ASSERT_EQ(0, KFS_CopyKey(source, 1, 1, nullptr, one, nullptr));
        ASSERT_EQ(0, KFS_CopyKeys(source, nullptr, all));
        EXPECT_EQ((std::vector<int>{10, 20}), all.Times());
        EXPECT_EQ(row.destination.spatial, KFSp_HasSpatialBlock(all.Record(0))) << "records keep their layout";
        std::vector<double> expected = source.Numbers(1);
        expected.resize(all.Numbers(1).size());  // the rest is zero
        EXPECT_EQ(expected, all.Numbers(1));
        EXPECT_EQ(expected, one.Numbers(0));
    }
}

TEST_F(CopyKeys, TheNamedKeysAreCopied)
{
    TestStream source({.timeScale = 30});
    source.Key(0, {0}).Key(15, {1}).Key(30, {2}, KFS_Interp_Hold).Key(45, {3});
    struct Row {
        std::vector<int> indices, times;
    };
    for (Row const& row : {Row{{}, {450}}, Row{{1, 3}, {300, 450, 900}}, Row{{3, 1, 1}, {300, 450, 900}}}) {
        TestStream destination;
        destination.Key(450, {9});
        ASSERT_EQ(0, KFS_CopyKeys(source, IndexList(row.indices), destination));
        EXPECT_EQ(row.times, destination.Times());
        EXPECT_EQ(0, source.Pins() + destination.Pins());
    }
}

TEST_F(CopyKeys, AConstantsValueArrivesWhateverTheTypes)
{
    TestStream source({.dimension = 2, .noKeys = true});
    source.Key(0, {3.25, -4.5});
    for (signed char const type : {KFS_Type_Double, KFS_Type_Float, KFS_Type_S16}) {
        for (bool const noKeys : {false, true}) {
            TestStream destination({.dimension = 2, .timeScale = 24, .noKeys = noKeys, .type = type});
            ASSERT_EQ(0, KFS_CopyKeys(source, nullptr, destination));
            EXPECT_EQ((std::vector<double>{3.25, -4.5}), destination.At(0)) << "type " << int(type);
            EXPECT_EQ(noKeys ? 0 : 1, destination.Count());
        }
    }
}

TEST_F(CopyKeys, AFailureTakesEverythingBack)
{
    TestStream source;
    source.Key(0, {0}).Key(300, {1}).Key(600, {2});
    TestStream destination;
    destination.Key(300, {9}, KFS_Interp_Spline).Key(450, {8});
    auto const before = destination.Bytes();
    HeardRoot root;
    root.Store(destination);
    EXPECT_EQ(SEQ_Err_BadIndex, KFS_CopyKeys(source, IndexList({0, 1, 2, 5}), destination));
    EXPECT_EQ(before, destination.Bytes());
    int calls = 0;
    ValueListener listener([&] {
        if (++calls == 2) throw 4711;
    });
    EXPECT_EQ(4711, KFS_CopyKeys(source, nullptr, destination));
    EXPECT_EQ(before, destination.Bytes());
    EXPECT_EQ(3, listener.Take()) << "and the listeners hear that the keys are gone again";
    EXPECT_EQ(0, source.Pins() + destination.Pins());
    EXPECT_EQ(9.0, destination.At1(300));
    EXPECT_EQ(0, KFS_CopyKeys(source, nullptr, destination));
    EXPECT_EQ(3, listener.Take());
    EXPECT_EQ((std::vector<int>{0, 300, 450, 600}), destination.Times());
}

// A listener who reads gives the float key among the copies its own time.
TEST_F(CopyKeys, AFailureTakesBackWhatAReadHasMoved)
{
    TestStream source({.dimension = 2, .spatial = true});
    source.Key(0, {0, 0}).Key(100, {8, 0}).Key(600, {9, 1}).Key(900, {0, 0});
    ASSERT_EQ(0, KFS_SetKeyFloat(source, 1, 1));
    TestStream destination({.dimension = 2, .spatial = true});
    destination.Key(300, {5, 5}).Key(700, {-5, 5});
    auto const before = destination.Times();
    HeardRoot root;
    root.Store(destination);
    int calls = 0;
    ValueListener listener([&] {
        destination.At(10);
        if (++calls == 4) throw 4711;
    });
    EXPECT_EQ(4711, KFS_CopyKeys(source, nullptr, destination));
    EXPECT_EQ(before, destination.Times());
}

TEST_F(CopyKeys, CustomValuesAreCopiedAndGivenBack)
{
    for (int run = 0; run < 8; ++run) {
        int const failure = run % 4;  // which key's insertion fails
        bool const reads = run >= 4;  // a listener, and what is read stays in the cache record
        OwnedValues::Scope const owned;
        HeardRoot root;
        auto const source = OwnedValues::MakeStream(false), destination = OwnedValues::MakeStream(false);
        for (int i = 0; i < 3; ++i) OwnedValues::InsertKey(source.get(), i * 100, i);
        OwnedValues::InsertKey(destination.get(), 100, 50);
        root.Store(destination.get());
        int calls = 0;
        ValueListener listener([&] {
            if (reads && destination->GetKeyCount() > 0) OwnedValues::Read(destination.get(), 50);
            if (++calls == failure) throw 4711;
        });
        EXPECT_EQ(failure != 0 ? 4711 : 0, KFS_CopyKeys(source.get(), nullptr, destination.get()));
        EXPECT_EQ((failure != 0 ? 4 : 6) + (reads ? 1 : 0), OwnedValues::Live());
        EXPECT_EQ(failure != 0 ? 50.0 : 1.0, OwnedValues::RemoveKey(destination.get(), failure != 0 ? 0 : 1));
    }
}

}  // namespace
