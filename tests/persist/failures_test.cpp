#include "keystore/attributes.h"
#include "overrides/streamexpression.h"
#include "tests/persist/treefile.h"

#include <climits>
#include <limits>
#include <random>

// Saves and loads that go wrong, whatever is saved and whatever goes wrong: what they leave can be used and saved again,
// and nothing of them stays behind.

namespace {

// Something that stands in files.
struct Saved {
    virtual ~Saved() = default;
    virtual void Write(CKF_File* file) const = 0;
    virtual void Read(CKF_File* file) = 0;
    // Whatever can be done with it. What comes out doesn't matter.
    virtual void Use() {}
    // What decides about how its content lies in memory.
    virtual std::vector<int> Shape() const { return {}; }
};

struct SavedLeaf : Saved {
    explicit SavedLeaf(StreamOptions const& options) : stream(options) {}
    void Write(CKF_File* file) const override { stream->Write(file); }
    void Read(CKF_File* file) override { stream->Read(file, nullptr); }
    void Use() override
    {
        EXPECT_EQ(KFS_StreamValidStamp, stream->GetStamp());
        EXPECT_EQ(0, stream.Pins());
        std::vector<double> value(static_cast<std::size_t>(stream->GetDimension()) * 8 + 1);
        for (int const time : {INT_MIN + 1, -7, 0, 1, 50, 100, 101, INT_MAX}) {
            T_Time const at{time, stream->GetTimeScale()};
            if (!stream->IsCustom())
                static_cast<void>(KFS_GetValueFPlus(stream, &at, 0, value.data(), nullptr, nullptr));
        }
        std::unique_ptr<KFS_Stream> const clone(stream->CloneLeaf({true, true}));
    }
    std::vector<int> Shape() const override
    {
        return {stream->GetDimension(), stream->IsSpatial(), stream->HasNoKeys(), stream->GetValueDesc()->itemSize};
    }
    TestStream stream;
};

struct SavedTree : Saved {
    void Write(CKF_File* file) const override { group->Write(file); }
    void Read(CKF_File* file) override { group->Read(file, nullptr); }
    void Use() override { static_cast<void>(group->IsModified()); }
    Q_ScAutoPtr<KFS_StreamBase> stream = TestKinds::Make("layers");
    KFS_IndexedStreamGroup* group = stream->GetAsIndexedGroup();
};

struct SavedPath : Saved {
    void Write(CKF_File* file) const override { path.Write(file); }
    void Read(CKF_File* file) override { path.Read(file, nullptr); }
    KFS_StreamIDPath path;
};

struct Scenario {
    char const* name;
    int major;
    std::function<std::unique_ptr<Saved>()> full, fresh;
};

std::function<std::unique_ptr<Saved>()> Leaf(StreamOptions const& options, bool filled)
{
    return [=] {
        auto leaf = std::make_unique<SavedLeaf>(options);
        if (!filled) return leaf;
        std::vector<double> const value(static_cast<std::size_t>(options.dimension), 3.0);
        leaf->stream.Key(0, value, KFS_Interp_Spline);
        if (!options.noKeys) leaf->stream.Key(60, value).Key(120, std::vector<double>(value.size(), -7.0));
        KFS_SetStreamExpression(leaf->stream, Q_MBToUTF16String("caf\xC3\xA9, and more than a short string holds"));
        FX_ParamDef def{};
        def.paramType = FX_Param_FLOAT_SLIDER;
        leaf->stream->SetParamDef(def);
        return leaf;
    };
}

std::unique_ptr<Saved> Tree()
{
    auto tree = std::make_unique<SavedTree>();
    for (char const* const kind : {"node", "opacity", "layers"}) {
        Q_ScAutoPtr<KFS_StreamBase> child = TestKinds::Make(kind);
        tree->group->AppendStream(&child);
    }
    SetValue(tree->group->GetEditableStream(0)->GetAsNamedGroup()->GetEditableStream(Name("opacity")), 1.0);
    tree->group->GetEditableStream(1)->SetDisplayName(Text("a name that is longer than a short string holds"));
    return tree;
}

std::unique_ptr<Saved> Path()
{
    auto saved = std::make_unique<SavedPath>();
    saved->path = KFS_StreamIDPath(KFS_StreamID(2, Name("a")), Name("b"), 7);
    return saved;
}

class Failures : public SceneTest {
protected:
    Failures()
    {
        StreamOptions const plain{}, spatial{.dimension = 2, .spatial = true}, constant{.noKeys = true},
            wide{.dimension = 3};
        scenarios = {
            {"a leaf", 95, Leaf(plain, true), Leaf(wide, true)},
            {"a leaf of an old version", 71, Leaf(plain, true), Leaf(plain, false)},
            {"a spatial leaf", 95, Leaf(spatial, true), Leaf(plain, true)},
            {"a constant", 95, Leaf(constant, true), Leaf(spatial, false)},
            {"a tree", 95, Tree, [] { return std::make_unique<SavedTree>(); }},
            {"a path", 95, Path, Path},
        };
        MakeNode();  // fills in what canonical groups keep
        for (Scenario const& s : scenarios) Read(*s.fresh(), Bytes(s, *s.full()));
    }
    static std::vector<unsigned char> Bytes(Scenario const& scenario, Saved const& saved)
    {
        MemoryFile const file([&](CKF_File* out) {
            out->SetVersion(scenario.major, 0);
            EXPECT_EQ(0, Thrown([&] { saved.Write(out); }));
        });
        return file.Bytes();
    }
    int Read(Saved& saved, std::vector<unsigned char> const& bytes)
    {
        int const code = Thrown([&] {
            CKF_File file;
            KFSp_ThrowIf(file.Open(bytes));
            saved.Read(&file);
        });
        reports.Take();
        return code;
    }
    // Reads what nobody wrote. Names that it brings are kept for good, so memory is asked for by the caller.
    int TryToRead(Scenario const& scenario, std::vector<unsigned char> const& bytes)
    {
        auto const saved = scenario.fresh();
        int const code = Read(*saved, bytes);
        static_cast<void>(KFSp_Boundary([&] { saved->Use(); }));
        CKF_File again;
        EXPECT_EQ(0, again.CreateInMemory());
        int const written = Thrown([&] { saved->Write(&again); });
        EXPECT_EQ(written == 0, again.Commit() == 0);
        reports.Take();
        return code;
    }
    std::vector<Scenario> scenarios;
};

TEST_F(Failures, EveryWriteMayFail)
{
    for (Scenario const& scenario : scenarios) {
        SCOPED_TRACE(scenario.name);
        auto const saved = scenario.full();
        auto const whole = Bytes(scenario, *saved);
        Q_MemoryCount const before = Q_MemoryLive(nullptr);
        for (int n = 1;; ++n) {
            ASSERT_LT(n, 200);
            FailNthAppend hook(n);
            {
                CKF_File file;
                file.SetVersion(scenario.major, 0);
                int code = file.CreateInMemory(&hook);  // fails for the first few
                if (code == 0) code = Thrown([&] { saved->Write(&file); });
                int const committed = file.Commit();
                EXPECT_EQ(hook.Fired() ? CKF_Err_Io : 0, committed) << n;
                EXPECT_TRUE(code == 0 || code == CKF_Err_Io);
            }
            EXPECT_EQ(before, Q_MemoryLive(nullptr));
            EXPECT_EQ(whole, Bytes(scenario, *saved));
            if (hook.Fired()) continue;
            EXPECT_LT(8, n);
            break;
        }
    }
}

TEST_F(Failures, EveryAllocationMayFail)
{
    for (Scenario const& scenario : scenarios) {
        SCOPED_TRACE(scenario.name);
        auto const whole = Bytes(scenario, *scenario.full());
        auto const before = scenario.fresh()->Shape(), after = scenario.full()->Shape();
        Q_MemoryCount const empty = Q_MemoryLive(nullptr);
        int failures = FailEveryAllocation(
            scenario.full, AtBoundary([&](Saved& saved) {
                CKF_File file;
                file.SetVersion(scenario.major, 0);
                KFSp_ThrowIf(file.CreateInMemory());
                int const code = Thrown([&] { saved.Write(&file); });
                EXPECT_TRUE(code == 0 || file.Commit() != 0) << "a save that failed isn't committed";
                return code;
            }),
            [&](Saved& saved, int, Q_MemoryCount const& live) {
                EXPECT_EQ(live, Q_MemoryLive(nullptr));
                reports.Take();
                EXPECT_EQ(whole, Bytes(scenario, saved));
            });
        failures += FailEveryAllocation(scenario.fresh, AtBoundary([&](Saved& saved) {
                                            CKF_File file;
                                            KFSp_ThrowIf(file.Open(whole));
                                            return Thrown([&] { saved.Read(&file); });
                                        }),
                                        [&](Saved& saved, int code, Q_MemoryCount const&) {
                                            reports.Take();
                                            auto const shape = saved.Shape();
                                            EXPECT_TRUE(shape == after || (code != 0 && shape == before))
                                                << "one or the other, never a mix";
                                            static_cast<void>(KFSp_Boundary([&] { saved.Use(); }));
                                            reports.Take();
                                            EXPECT_EQ(0, Read(saved, whole)) << "it can be tried again";
                                        });
        EXPECT_LT(1, failures);
        EXPECT_EQ(empty, Q_MemoryLive(nullptr));
    }
}

// A file that ends early, as it is or with every list ending where its content does.
std::vector<unsigned char> CutAt(std::vector<unsigned char> const& whole, std::size_t size, bool consistent)
{
    std::string bytes(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(size));
    CKF_ChunkWalk walk(whole);
    CKF_RawChunk chunk;
    while (consistent && walk.Next(&chunk)) {
        if (chunk.listType != 0 && chunk.offset + 12 <= size) {
            auto const left = static_cast<std::uint32_t>(size - chunk.offset - 8);
            bytes.replace(chunk.offset + 4, 4, Long(std::min(left, chunk.claimedSize + 4)));
        }
    }
    return {bytes.begin(), bytes.end()};
}

TEST_F(Failures, EveryCutAndEveryBentByteIsAnswered)
{
    std::mt19937 random(11);
    static constexpr unsigned char Values[] = {0, 1, 2, 3, 0x7F, 0x80, 0xFF};
    for (Scenario const& scenario : scenarios) {
        SCOPED_TRACE(scenario.name);
        auto const whole = Bytes(scenario, *scenario.full());
        Q_MemoryCount const before = Q_MemoryLive(nullptr);
        for (std::size_t size = 0; size + 2 < whole.size(); size += 2) {
            EXPECT_NE(0, TryToRead(scenario, CutAt(whole, size, false))) << size;
            if (size > 32) TryToRead(scenario, CutAt(whole, size, true));
        }
        EXPECT_GT(4096, Q_MemoryLive(nullptr).bytes - before.bytes) << "names that are cut are names";
        for (std::size_t at = 32; at < whole.size() + 400; ++at) {
            auto bytes = whole;
            if (at < whole.size()) bytes[at] = static_cast<unsigned char>(bytes[at] ^ (1U << (random() % 8)));
            // Behind the headers, so that the damage reaches the content.
            for (std::size_t i = 0; at >= whole.size() && i < 1 + at % 12; ++i)
                bytes[60 + random() % (bytes.size() - 60)] = Values[random() % std::size(Values)];
            TryToRead(scenario, bytes);
        }
        // Names that files bring are kept for good, texts of reports too.
        EXPECT_GT(1 << 20, Q_MemoryLive(nullptr).bytes - before.bytes);
    }
}

TEST_F(Failures, GroupsInGroupsHaveAnEnd)
{
    for (int const depth : {CKF_MaxDepth / 2, 2 * CKF_MaxDepth}) {
        std::string file = Group(Marker, "");
        for (int i = 1; i < depth; ++i) file = Group(Marker, MatchName("layers") + file);
        SavedTree tree;
        EXPECT_EQ(depth > CKF_MaxDepth ? CKF_Err_TooDeep : 0, ReadGroup(tree.group, Form(file)));
    }
}

}  // namespace
