#include "services/utility/context_private.h"

#include "frame/services/reports.h"

#include <boost/make_shared.hpp>

#include <algorithm>
#include <atomic>
#include <mutex>
#include <string>
#include <unordered_set>
#include <utility>

constinit thread_local Q_RenderContext* Qp_currentRenderContext = nullptr;

namespace {

constinit thread_local Q_Context* currentContext = nullptr;

// One thread's current object: the owner, and beside it the bare pointer, which can be read without the check whether
// the thread has constructed its owner yet.
template <class T, T*& (*Bare)()>
struct Current {
    static inline thread_local boost::shared_ptr<T> owner;

    static boost::shared_ptr<T> Set(boost::shared_ptr<T> next) noexcept
    {
        Bare() = next.get();
        owner.swap(next);
        return next;
    }

    static boost::shared_ptr<T> Get(bool tolerateNone, char const* complaint)
    {
        if (Bare()) return owner;
        if (!tolerateNone) Q_ReportFailedVerification(0, 0, 0, complaint);
        return {};
    }
};

Q_Context*& BareContext()
{
    return currentContext;
}
Q_RenderContext*& BareRenderContext()
{
    return Qp_currentRenderContext;
}
using CurrentContext = Current<Q_Context, BareContext>;
using CurrentRenderContext = Current<Q_RenderContext, BareRenderContext>;

constexpr char const* NoContext = "there is no current context";
constexpr char const* NoRenderContext = "there is no current render context";

std::uint64_t NextStamp() noexcept
{
    static std::atomic<std::uint64_t> last{0};
    return last.fetch_add(1, std::memory_order_relaxed) + 1;
}

}  // namespace

namespace hearth::utility {

char const* const ImmutableString::Empty = "";

ImmutableString ImmutableString::Create(char const* text)
{
    if (!text || *text == 0) return {};
    // Never destroyed: names made at load are used until the very end.
    static std::mutex* const mutex = new std::mutex;
    static std::unordered_set<std::string>* const pool = new std::unordered_set<std::string>;
    std::lock_guard<std::mutex> const lock(*mutex);
    return ImmutableString(pool->emplace(text).first->c_str());
}

}  // namespace hearth::utility

Q_Context::~Q_Context() = default;

bool Q_Context::HasCurrent() noexcept
{
    return currentContext != nullptr;
}

boost::shared_ptr<Q_Context> Q_Context::GetCurrent(bool tolerateNone)
{
    return CurrentContext::Get(tolerateNone, NoContext);
}

boost::shared_ptr<Q_Context const> Q_Context::GetCurrentConst(bool tolerateNone)
{
    return GetCurrent(tolerateNone);
}

Q_Context* Q_Context::PeekCurrent() noexcept
{
    return currentContext;
}

Q_RenderState::~Q_RenderState() = default;

boost::shared_ptr<Q_RenderContext> Q_RenderContext::MakeNewContext(bool tempClone)
{
    return boost::make_shared<Q_RenderContext>(tempClone);
}

Q_RenderContext::Q_RenderContext(bool tempClone) : statesStamp_(NextStamp()), tempClone_(tempClone) {}

Q_RenderContext::~Q_RenderContext() = default;

boost::shared_ptr<Q_RenderContext> Q_RenderContext::GetCurrent(bool tolerateNone)
{
    return CurrentRenderContext::Get(tolerateNone, NoRenderContext);
}

Q_RenderContext* Q_RenderContext::PeekCurrent() noexcept
{
    return Qp_currentRenderContext;
}

boost::shared_ptr<Q_RenderState> Q_RenderContext::GetState(hearth::utility::ImmutableString const& name) const
{
    for (NamedState const& named : states_)
        if (named.name == name) return named.state;
    return {};
}

Q_RenderState* Q_RenderContext::PeekState(hearth::utility::ImmutableString const& name) const noexcept
{
    for (NamedState const& named : states_)
        if (named.name == name) return named.state.get();
    return nullptr;
}

void Q_RenderContext::SetState(boost::shared_ptr<Q_RenderState> const& state)
{
    if (!state) return;
    NamedState next{state->GetStateName(), state};
    auto const place =
        std::find_if(states_.begin(), states_.end(), [&](NamedState const& named) { return named.name == next.name; });
    if (place == states_.end())
        states_.push_back(std::move(next));
    else
        place->state.swap(next.state);  // the earlier state goes at the end of this scope, when all is in order
    statesStamp_ = NextStamp();
}

void Q_RenderContext::RemoveState(hearth::utility::ImmutableString const& name)
{
    auto const place =
        std::find_if(states_.begin(), states_.end(), [&](NamedState const& named) { return named.name == name; });
    if (place == states_.end()) return;
    NamedState const removed = std::move(*place);
    states_.erase(place);
    statesStamp_ = NextStamp();
}

Q_ScSetCurrentContext::Q_ScSetCurrentContext(boost::shared_ptr<Q_Context> context) noexcept
    : previous_(CurrentContext::Set(std::move(context)))
{}

Q_ScSetCurrentContext::~Q_ScSetCurrentContext()
{
    CurrentContext::Set(std::move(previous_));
}

Q_ScSetCurrentRenderContext::Q_ScSetCurrentRenderContext(boost::shared_ptr<Q_RenderContext> context) noexcept
    : previous_(CurrentRenderContext::Set(std::move(context)))
{}

Q_ScSetCurrentRenderContext::~Q_ScSetCurrentRenderContext()
{
    CurrentRenderContext::Set(std::move(previous_));
}
