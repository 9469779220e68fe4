#include "keystore/cachestate.h"
#include "keystore/keyflags.h"
#include "tests/support/streams.h"

#include <atomic>
#include <random>
#include <thread>

namespace {

constexpr int Renders = 8;
constexpr int Keys = 40;
constexpr int Span = Keys * 60;

class RenderThreads : public StreamTest {
protected:
    RenderThreads()
    {
        std::mt19937 random(3);
        std::uniform_real_distribution<double> value(-100.0, 100.0);
        for (int i = 0; i < Keys; ++i) {
            plain.Key(i * 60, {value(random), value(random)}, i % 3 ? KFS_Interp_Spline : KFS_Interp_Linear);
            spatial.Key(i * 60, {value(random), value(random), value(random)}, KFS_Interp_Spline);
            if (i % 4 == 2) EXPECT_EQ(0, KFS_SetKeyModifiable(plain, 1, i));
        }
    }

    std::vector<double> Sample() const
    {
        std::vector<double> samples;
        for (int time = -30; time < Span + 30; time += 7) {
            for (TestStream const* const stream : {&plain, &spatial}) {
                std::vector<double> const value = stream->At(time);
                samples.insert(samples.end(), value.begin(), value.end());
            }
        }
        return samples;
    }

    // Only the external forms: the double forms change a stream's description for the length of the call.
    void Edit(std::mt19937& random)
    {
        int const time = static_cast<int>(random() % static_cast<unsigned>(Span));
        double const value[3] = {1.0 * time, -1.0 * time, 5.0};
        T_Time const at{time, 600};
        for (KFS_Stream* const stream : {plain.get(), spatial.get()}) {
            EXPECT_EQ(0, KFS_InsertKey(stream, &at, 1, value, KFS_Interp_Spline, KFS_Interp_Linear));
            if (stream->GetKeyCount() > Keys)
                EXPECT_EQ(0, KFS_RemoveKey(stream, static_cast<int>(random() % Keys), nullptr));
            double read[3];
            EXPECT_EQ(0, KFS_GetValuePlus(stream, &at, 0, read, nullptr, nullptr, nullptr, 0));
        }
    }

    TestStream plain{{.dimension = 2}};
    TestStream spatial{{.dimension = 3, .spatial = true}};
};

// The host's gate: the main thread holds its edits until every render has its copies. From then on reads and edits run
// side by side.
TEST_F(RenderThreads, RendersSeeTheStreamsAsTheyStoodWhileTheMainThreadEdits)
{
    std::vector<double> const asTheyStood = Sample();
    std::mt19937 random(11);
    Edit(random);  // leaves stale ranges for the copies to repair
    std::vector<double> const expected = [&] {
        Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
        return Sample();
    }();
    ASSERT_NE(asTheyStood, expected);
    auto const stale = plain.Stale();
    auto const arcStale = spatial.ArcStale();

    std::atomic<int> ready{0}, done{0}, differing{0};
    std::atomic<bool> go{false};
    std::vector<std::thread> renders;
    for (int r = 0; r < Renders; ++r) {
        renders.emplace_back([&] {
            Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
            std::vector<double> const first = Sample();  // under the gate: nobody edits
            ++ready;
            while (!go) std::this_thread::yield();
            for (int pass = 0; pass < 3; ++pass)
                if (Sample() != expected || first != expected) ++differing;
            ++done;
        });
    }
    while (ready < Renders) std::this_thread::yield();
    EXPECT_EQ(stale, plain.Stale()) << "renders repair their copies alone";
    EXPECT_EQ(arcStale, spatial.ArcStale());
    go = true;
    int edits = 0;
    do {
        Edit(random);
        ++edits;
    } while (done < Renders);
    for (std::thread& render : renders) render.join();
    EXPECT_EQ(0, differing);
    EXPECT_GT(edits, 1);
    EXPECT_NE(expected, Sample());
}

TEST_F(RenderThreads, ReportsOfRendersDontMix)
{
    TestStream const empty;
    std::atomic<int> wrong{0};
    std::vector<std::thread> renders;
    for (int r = 0; r < 4; ++r) {
        renders.emplace_back([&] {
            Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
            T_Time const at{0, 600};
            double value = 0.0;
            for (int i = 0; i < 100; ++i)
                if (KFS_GetValueFPlus(empty, &at, 0, &value, nullptr, nullptr) != 7427) ++wrong;
        });
    }
    for (std::thread& render : renders) render.join();
    EXPECT_EQ(0, wrong);
    std::vector<Reported> const seen = reports.Take();
    EXPECT_EQ(400u, seen.size());
    for (Reported const& report : seen)
        ASSERT_EQ(KfsReport(36, "attempt to get a value from a time stream with no key values."), report);
}

}  // namespace
