#include "keystore/attributes.h"
#include "overrides/streamexpression.h"
#include "tests/persist/leaffile.h"

#include <climits>
#include <limits>
#include <random>

// Files that nobody wrote: whatever stands in one, reading it gives a stream or a code, and the stream can be used.

namespace {

class LeafHostile : public StreamTest {
protected:
    // Uses what a read has left in the stream. What it answers doesn't matter.
    void Use(KFS_Stream* stream)
    {
        std::vector<double> value(static_cast<std::size_t>(stream->GetDimension()) * 8 + 1);
        for (int const time : {INT_MIN + 1, -7, 0, 1, 50, 100, 101, INT_MAX}) {
            T_Time const at{time, stream->GetTimeScale()};
            if (!stream->IsCustom())
                static_cast<void>(KFS_GetValueFPlus(stream, &at, 0, value.data(), nullptr, nullptr));
        }
        static_cast<void>(KFSp_Boundary([&] {
            std::unique_ptr<KFS_Stream> const clone(stream->CloneLeaf({true, true}));
        }));
        static_cast<void>(reports.Take());
    }
};

// Leaves of several shapes, written by this build.
std::vector<std::string> Samples()
{
    std::vector<std::string> samples;
    for (int shape = 0; shape < 4; ++shape) {
        StreamOptions options;
        options.spatial = shape % 2 == 1;
        options.dimension = options.spatial ? 2 : 1;
        options.noKeys = shape == 3;
        TestStream stream(options);
        for (int i = 0; i < (options.noKeys ? 1 : 4); ++i) {
            std::vector<double> const value(static_cast<std::size_t>(options.dimension), i * 3.0 - 2);
            stream.Key(i * 33, value, static_cast<char>(1 + i % 3));
        }
        if (shape > 1) KFS_SetStreamExpression(stream, Text("time * 2"));
        MemoryFile const file = Written(stream);
        samples.emplace_back(file.Bytes().begin(), file.Bytes().end());
    }
    return samples;
}

void ReadAny(KFS_Stream* stream, std::string const& bytes)
{
    CKF_File file;
    if (file.Open(Span(bytes)) == 0) static_cast<void>(Thrown([&] { stream->Read(&file, nullptr); }));
}

// Times in no order, all the same, and at both ends of what an int can be; numbers that are none.
TEST_F(LeafHostile, KeysThatMakeNoSense)
{
    double const infinity = std::numeric_limits<double>::infinity();
    double const values[] = {0.0, 1e300, -infinity, infinity, std::numeric_limits<double>::quiet_NaN(), 1.0};
    int const times[] = {INT_MAX, INT_MIN, 5, 5, 5, 0, -1, 100, INT_MIN};
    std::mt19937 random(13);
    for (int round = 0; round < 400; ++round) {
        bool const spatial = round % 2 == 1;
        int const dimension = spatial ? 1 + round % 5 : 1;
        std::vector<std::string> items;
        for (std::size_t i = 0; i < 2 + random() % 6; ++i) {
            std::string item = KeyHead(times[random() % std::size(times)], static_cast<int>(random() % 7) - 2,
                                       static_cast<int>(random() % 7) - 2, random() & 0xFFFF);
            if (spatial) item += Long(random()) + Long(0);
            for (int n = 0; n < (spatial ? 5 + 3 * dimension : 5); ++n)
                item += Double(values[random() % std::size(values)]);
            items.push_back(item);
        }
        LeafRecord record;
        unsigned const flags = (random() & 0xFFFC) | (spatial ? 2U : 0U);
        record.Dimension(dimension).Flags(flags).HasList().Put(6, Short(random() & 0xFFFF));
        record.Put(24, Double(values[random() % std::size(values)]));
        TestStream stream;
        ASSERT_EQ(0, ReadLeaf(stream, Form(Leaf(record, Keys(static_cast<int>(items[0].size()), items)))));
        Use(stream);
        static_cast<void>(KFS_RescaleStream(stream, 24000));
        Use(stream);
    }
}

// Memory in proportion to the file: nothing is made for what a file only claims.
TEST_F(LeafHostile, ClaimsCostNothing)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    {
        TestStream stream;
        std::string const claims[] = {Atom("seql", Long(1) + Long(0x7FFFFFFF)),
                                      Atom("seql", Long(32767) + Long(0x10001)),
                                      Atom("seql", Long(48) + Long(0xFFFFFFFF)), Atom("seql", Long(0) + Long(5)),
                                      Atom("seql", Long(0x10030) + Long(1) + std::string(48, '\0'))};
        for (std::string const& claim : claims) {
            EXPECT_NE(0, ReadLeaf(stream, Form(Leaf(LeafRecord().Flags(0).HasList(), claim))));
            EXPECT_EQ(0, stream.Count());
            static_cast<void>(reports.Take());
        }
        EXPECT_LT(Q_MemoryLive(nullptr).bytes - before.bytes, 8192);
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

}  // namespace
