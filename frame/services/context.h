// Where the running code is: the current context says for which project, the current render context for which render.
//
// Both are properties of the thread. They are set for a scope by the host and read by the library, on the way of every
// value: PeekCurrent, PeekState and GetStatesStamp exist for that, and take no lock and no reference.
//
// Threads: a context may be current on several threads. Its states must not be changed while another thread uses it.
#pragma once

#include "frame/services/export.h"

#include <boost/shared_ptr.hpp>

#include <cstddef>
#include <cstdint>
#include <functional>
#include <vector>

namespace hearth::utility {

// An interned name. Two names made from the same text are the same object, so comparing them compares addresses. The
// text is kept until the process ends. Creating one takes a lock; copying and comparing don't.
class ImmutableString {
public:
    // The name without a text.
    ImmutableString() noexcept = default;
    // A null text is the empty one. Throws std::bad_alloc.
    KFS_SERVICE_API static ImmutableString Create(char const* text);

    char const* c_str() const noexcept { return text_; }
    bool operator==(ImmutableString const& other) const noexcept { return text_ == other.text_; }

private:
    explicit ImmutableString(char const* text) noexcept : text_(text) {}

    KFS_SERVICE_API static char const* const Empty;
    char const* text_ = Empty;
};

}  // namespace hearth::utility

template <>
struct std::hash<hearth::utility::ImmutableString> {
    std::size_t operator()(hearth::utility::ImmutableString const& name) const noexcept
    {
        return std::hash<void const*>()(name.c_str());
    }
};

// Says which project the running code belongs to. Hosts and the library derive from it.
class KFS_SERVICE_API Q_Context {
public:
    Q_Context() = default;
    virtual ~Q_Context();

    // Whether the calling thread has a current context.
    static bool HasCurrent() noexcept;
    // The calling thread's current context. Without one the answer is null, and unless `tolerateNone` is set a failed
    // verification is reported.
    static boost::shared_ptr<Q_Context> GetCurrent(bool tolerateNone);
    static boost::shared_ptr<Q_Context const> GetCurrentConst(bool tolerateNone);
    // The same without a reference and without a report: valid while the scope that made it current lasts.
    static Q_Context* PeekCurrent() noexcept;

protected:
    Q_Context(Q_Context const&) = default;
    Q_Context& operator=(Q_Context const&) = default;
};

// The base of the named objects that a render context carries.
class KFS_SERVICE_API Q_RenderState {
public:
    virtual hearth::utility::ImmutableString const& GetStateName() const = 0;
    virtual ~Q_RenderState();
};

// Carries the state of one render, by name.
class KFS_SERVICE_API Q_RenderContext {
public:
    // Made for the main thread or a shared render (false), or for one render's private use (true).
    static boost::shared_ptr<Q_RenderContext> MakeNewContext(bool tempClone);
    explicit Q_RenderContext(bool tempClone);
    Q_RenderContext(Q_RenderContext const&) = delete;
    Q_RenderContext& operator=(Q_RenderContext const&) = delete;
    virtual ~Q_RenderContext();

    // The calling thread's current render context, with the bool of Q_Context::GetCurrent.
    static boost::shared_ptr<Q_RenderContext> GetCurrent(bool tolerateNone);
    // The same without a reference and without a report: one load of a thread-local pointer. Valid while the scope that
    // made it current lasts.
    static Q_RenderContext* PeekCurrent() noexcept;

    // Whether a render cloned this context for itself: reads then work on private copies of what they write.
    bool GetIsTempCloneContext() const noexcept { return tempClone_; }

    // The state of that name, or null.
    boost::shared_ptr<Q_RenderState> GetState(hearth::utility::ImmutableString const& name) const;
    // The same without a reference: valid until the state is replaced or removed.
    Q_RenderState* PeekState(hearth::utility::ImmutableString const& name) const noexcept;

    // Stores a state under its own name in the place of an earlier one of that name. Null is ignored.
    void SetState(boost::shared_ptr<Q_RenderState> const& state);
    // Removes the state of that name, if there is one.
    void RemoveState(hearth::utility::ImmutableString const& name);

    // A number that no other context has or had, and that this one has only until its states change. Never 0. Whoever
    // remembers what PeekState said may go on using it while the current context's stamp stays the same.
    std::uint64_t GetStatesStamp() const noexcept { return statesStamp_; }

private:
    struct NamedState {
        hearth::utility::ImmutableString name;
        boost::shared_ptr<Q_RenderState> state;
    };

    std::uint64_t statesStamp_;
    bool tempClone_;
    std::vector<NamedState> states_;  // a handful: searched from the front
};

// Makes a context current on the calling thread, and at the end of the scope the one that was current before. Null
// means none. Scopes must end on their own thread, in the reverse order of their beginning.
class KFS_SERVICE_API Q_ScSetCurrentContext {
public:
    explicit Q_ScSetCurrentContext(boost::shared_ptr<Q_Context> context) noexcept;
    Q_ScSetCurrentContext(Q_ScSetCurrentContext const&) = delete;
    Q_ScSetCurrentContext& operator=(Q_ScSetCurrentContext const&) = delete;
    ~Q_ScSetCurrentContext();

private:
    boost::shared_ptr<Q_Context> previous_;
};

// The same for the render context.
class KFS_SERVICE_API Q_ScSetCurrentRenderContext {
public:
    explicit Q_ScSetCurrentRenderContext(boost::shared_ptr<Q_RenderContext> context) noexcept;
    Q_ScSetCurrentRenderContext(Q_ScSetCurrentRenderContext const&) = delete;
    Q_ScSetCurrentRenderContext& operator=(Q_ScSetCurrentRenderContext const&) = delete;
    ~Q_ScSetCurrentRenderContext();

private:
    boost::shared_ptr<Q_RenderContext> previous_;
};
