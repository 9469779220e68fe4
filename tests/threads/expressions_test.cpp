#include "frame/services/strings.h"
#include "host/expression.h"
#include "host/projectfile.h"
#include "host/session.h"
#include "host/streambuilder.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"
#include "overrides/parambag.h"
#include "overrides/streamexpression.h"

#include <boost/make_shared.hpp>
#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

namespace {

constexpr int Renders = 8;
constexpr int Span = 24 * 10;

// Three streams that read each other and their own keys, one of which fails from the sixth second on.
class ExpressionRenders : public testing::Test {
protected:
    ExpressionRenders()
    {
        kfshost::Scene scene;
        scene.timeScale = 24;
        for (char const* node : {"A", "B", "C"}) {
            kfshost::StreamBuilder builder(3, 24, node);
            for (int time = 0; time <= Span; time += 12) {
                double const value[3] = {time * 0.5, time % 7 * 1.0, node[0] * 1.0};
                builder.Append(time, value, KFS_Interp_Spline, KFS_Interp_Spline);
            }
            kfshost::StreamItem item;
            item.animation = "x";
            item.node = node;
            item.kind = kfshost::StreamKind::Scale;
            item.components = kfshost::UsualComponents(item.kind, 3);
            item.stream = builder.Take();
            scene.streams.push_back(std::move(item));
        }
        tree = kfshost::MakeTree(std::move(scene));
        for (kfshost::ListedStream const& listed : kfshost::ListStreams(*tree))
            streams.push_back(const_cast<KFS_Stream*>(listed.stream));
        Set(0, "value * 2 + stream('x/B/scale', time - 0.25)");
        Set(1, "local s = vec(0, 0, 0) for i = 1, 5 do s = s + at(time - i / 24) end return s / 5 + random(frame, 1)");
        Set(2, "if time > 6 then error('over') end return extend('cycle', 'offset', time * 3) + stream('x/A/scale')");
        kfshost::PrepareExpressions(*tree);
        bag.AddOverride(streams[1], boost::make_shared<KFS_StreamOverride>(
                                        streams[1], KFS_OverrideValue(std::vector<double>{1.0, 2.0, 3.0}), false));
    }

    void Set(std::size_t place, char const* text)
    {
        KFS_SetStreamExpression(streams[place], Q_AsciiToUTF16String(text));
    }

    std::vector<double> Sample() const
    {
        std::vector<double> samples;
        for (KFS_ParamBag const* const overrides : {static_cast<KFS_ParamBag const*>(nullptr), &bag}) {
            for (int time = 0; time < Span; time += 5) {
                for (KFS_Stream const* const stream : streams) {
                    double value[3] = {};
                    T_Time const at{time, 24};
                    EXPECT_EQ(0, KFS_GetValueFPlus(stream, &at, 0, value, nullptr, overrides));
                    samples.insert(samples.end(), std::begin(value), std::end(value));
                }
            }
        }
        for (kfshost::ExpressionError const& error : kfshost::TakeExpressionErrors()) samples.push_back(error.line);
        return samples;
    }

    kfshost::Session session;
    std::unique_ptr<kfshost::SceneGroup> tree;
    std::vector<KFS_Stream*> streams;
    KFS_ParamBag bag;
};

TEST_F(ExpressionRenders, AnswerAsTheStreamsStoodWhileKeysAndTextsAreEdited)
{
    std::vector<double> const expected = Sample();
    std::atomic<int> ready{0}, done{0}, differing{0};
    std::atomic<bool> go{false};
    std::vector<std::thread> renders;
    for (int r = 0; r < Renders; ++r) {
        renders.emplace_back([&] {
            Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
            bool const wasRight = Sample() == expected;  // under the gate: the copies are made
            ++ready;
            while (!go) std::this_thread::yield();
            for (int pass = 0; pass < 3; ++pass)
                if (!wasRight || Sample() != expected) ++differing;
            ++done;
        });
    }
    while (ready < Renders) std::this_thread::yield();
    go = true;
    int edits = 0;
    do {
        for (KFS_Stream* const stream : streams) {
            T_Time const at{edits % Span, 24};
            double const value[3] = {edits * 1.0, 0.0, 0.0};
            ASSERT_EQ(0, KFS_InsertKeyF(stream, &at, 1, value, KFS_Interp_Linear, KFS_Interp_Spline));
        }
        Set(0, edits % 2 == 0 ? "stream('x/C/scale')" : "value + stream('x/B/scale', 0)");
        Set(1, edits % 3 == 0 ? "frame +" : "smooth(1)");
        Set(2, "{time, time, 1}");
        Sample();
        ++edits;
    } while (done < Renders);
    for (std::thread& render : renders) render.join();
    EXPECT_EQ(0, differing);
    EXPECT_NE(expected, Sample());
}

}  // namespace
