#include "frame/services/context.h"
#include "frame/services/reports.h"

#include <gtest/gtest.h>

#include <boost/make_shared.hpp>

#include <set>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

using hearth::utility::ImmutableString;

namespace {

class State : public Q_RenderState {
public:
    explicit State(char const* name, int* destroyed = nullptr)
        : name_(ImmutableString::Create(name)),
          destroyed_(destroyed)
    {}
    ~State() override
    {
        if (destroyed_) ++*destroyed_;
    }
    ImmutableString const& GetStateName() const override { return name_; }

private:
    ImmutableString name_;
    int* destroyed_;
};

TEST(ImmutableString, IsTheSameObjectForTheSameText)
{
    char text[] = "RenderState";
    ImmutableString const a = ImmutableString::Create(text);
    text[0] = 'X';
    const ImmutableString b = ImmutableString::Create("RenderState");
    EXPECT_EQ(a, b);
    EXPECT_EQ(a.c_str(), b.c_str());
    EXPECT_STREQ("RenderState", a.c_str());
    EXPECT_NE(a, ImmutableString::Create("RenderStat"));
    EXPECT_EQ(ImmutableString(), ImmutableString::Create(""));
    EXPECT_EQ(ImmutableString(), ImmutableString::Create(nullptr));
    EXPECT_STREQ("", ImmutableString().c_str());

    char const* other = nullptr;
    std::thread([&] {
        for (int i = 0; i < 2000; ++i) ImmutableString::Create(("name " + std::to_string(i)).c_str());
        other = ImmutableString::Create("RenderState").c_str();
    }).join();
    EXPECT_EQ(a.c_str(), other) << "and stays where it is while the pool grows";
}

TEST(Context, ScopesNestAndRestoreAlsoByException)
{
    auto const outer = boost::make_shared<Q_Context>();
    auto const inner = boost::make_shared<Q_Context>();
    EXPECT_FALSE(Q_Context::HasCurrent());
    {
        Q_ScSetCurrentContext const scope(outer);
        try {
            Q_ScSetCurrentContext const innerScope(inner);
            EXPECT_EQ(inner, Q_Context::GetCurrent(false));
            EXPECT_EQ(inner.get(), Q_Context::PeekCurrent());
            Q_ScSetCurrentContext const noneScope(nullptr);
            EXPECT_FALSE(Q_Context::HasCurrent());
            throw std::runtime_error("on the way out");
        } catch (std::runtime_error const&) {}
        EXPECT_EQ(outer, Q_Context::GetCurrentConst(false));
        std::thread([] { EXPECT_FALSE(Q_Context::HasCurrent()) << "another thread has its own"; }).join();
    }
    EXPECT_FALSE(Q_Context::HasCurrent());
    EXPECT_EQ(nullptr, Q_Context::PeekCurrent());
    EXPECT_EQ(1, inner.use_count()) << "nothing keeps a reference";
}

TEST(Context, AskingForNoneIsToleratedOrReported)
{
    std::vector<std::string> reports;
    Q_ReportSink const previous = Q_SetReportSink([&](Q_Report const& report) {
        EXPECT_EQ(Q_ReportKind::Verification, report.kind);
        reports.push_back(report.text);
    });
    EXPECT_EQ(nullptr, Q_Context::GetCurrent(true));
    EXPECT_EQ(nullptr, Q_RenderContext::GetCurrent(true));
    EXPECT_TRUE(reports.empty());
    EXPECT_EQ(nullptr, Q_Context::GetCurrent(false));
    EXPECT_EQ(nullptr, Q_Context::GetCurrentConst(false));
    EXPECT_EQ(nullptr, Q_RenderContext::GetCurrent(false));
    Q_SetReportSink(previous);
    EXPECT_EQ((std::vector<std::string>{"there is no current context", "there is no current context",
                                        "there is no current render context"}),
              reports);
}

TEST(RenderContext, IsCurrentPerThread)
{
    auto const mine = Q_RenderContext::MakeNewContext(false);
    auto const theirs = Q_RenderContext::MakeNewContext(true);
    EXPECT_FALSE(mine->GetIsTempCloneContext());
    EXPECT_TRUE(theirs->GetIsTempCloneContext());
    Q_ScSetCurrentRenderContext const scope(mine);
    std::thread([&] {
        EXPECT_EQ(nullptr, Q_RenderContext::PeekCurrent());
        Q_ScSetCurrentRenderContext const other(theirs);
        EXPECT_EQ(theirs.get(), Q_RenderContext::PeekCurrent());
    }).join();
    EXPECT_EQ(mine.get(), Q_RenderContext::PeekCurrent());
    EXPECT_EQ(mine, Q_RenderContext::GetCurrent(false));
    EXPECT_EQ(1, theirs.use_count());
}

TEST(RenderContext, KeepsOneStateOfAName)
{
    int destroyed = 0;
    auto const context = Q_RenderContext::MakeNewContext(true);
    const ImmutableString name = ImmutableString::Create("ExpState");
    auto const first = boost::make_shared<State>("ExpState", &destroyed);
    EXPECT_EQ(nullptr, context->GetState(name));
    context->SetState(first);
    context->SetState(boost::make_shared<State>("Other", &destroyed));
    EXPECT_EQ(first, context->GetState(name));
    EXPECT_EQ(first.get(), context->PeekState(name));

    auto const second = boost::make_shared<State>("ExpState", &destroyed);
    context->SetState(second);
    EXPECT_EQ(second, context->GetState(name));
    EXPECT_EQ(1, first.use_count());
    context->RemoveState(ImmutableString::Create("Other"));
    EXPECT_EQ(1, destroyed);
    EXPECT_EQ(nullptr, context->PeekState(ImmutableString::Create("Other")));
    EXPECT_EQ(second.get(), context->PeekState(name));
}

TEST(RenderContext, EveryChangeOfStatesHasAStampThatNoOtherHad)
{
    std::set<std::uint64_t> stamps;
    auto const isNew = [&](std::uint64_t stamp) { return stamp != 0 && stamps.insert(stamp).second; };
    for (int i = 0; i < 50; ++i) {
        auto const context = Q_RenderContext::MakeNewContext(i % 2 == 0);  // the next one may lie at the same address
        EXPECT_TRUE(isNew(context->GetStatesStamp()));
        context->SetState(boost::make_shared<State>("A"));
        EXPECT_TRUE(isNew(context->GetStatesStamp()));
        context->SetState(boost::make_shared<State>("A"));
        EXPECT_TRUE(isNew(context->GetStatesStamp())) << "a replacement is a change";
        context->RemoveState(ImmutableString::Create("A"));
        EXPECT_TRUE(isNew(context->GetStatesStamp()));
        std::uint64_t const last = context->GetStatesStamp();
        context->RemoveState(ImmutableString::Create("A"));
        context->SetState(nullptr);
        EXPECT_EQ(nullptr, context->PeekState(ImmutableString::Create("A")));
        EXPECT_EQ(last, context->GetStatesStamp()) << "what changes nothing keeps what readers remember";
    }
}

}  // namespace
