// Owners and restorers for one scope.
#pragma once

#include <optional>
#include <utility>

// Owns one object and deletes it at the end of the scope. An operation that takes over the object of a Q_ScAutoPtr
// passed by address does so with release(), which leaves null behind.
template <class T>
class Q_ScAutoPtr {
public:
    explicit Q_ScAutoPtr(T* object = nullptr) noexcept : object_(object) {}
    Q_ScAutoPtr(Q_ScAutoPtr&& other) noexcept : object_(other.release()) {}
    template <class Derived>
    Q_ScAutoPtr(Q_ScAutoPtr<Derived>&& other) noexcept : object_(other.release())
    {}
    Q_ScAutoPtr& operator=(Q_ScAutoPtr&& other) noexcept
    {
        reset(other.release());
        return *this;
    }
    ~Q_ScAutoPtr() { delete object_; }

    T* get() const noexcept { return object_; }
    T* operator->() const noexcept { return object_; }
    T& operator*() const noexcept { return *object_; }
    explicit operator bool() const noexcept { return object_ != nullptr; }

    // Gives the object away undeleted.
    T* release() noexcept { return std::exchange(object_, nullptr); }
    // Deletes the object held so far, unless it is the same.
    void reset(T* object = nullptr) noexcept
    {
        if (object != object_) delete std::exchange(object_, object);
    }

private:
    T* object_;
};

// Remembers the value of a variable and writes it back at the end of the scope, also when the scope ends by an
// exception. The variable must outlive the scope. If writing back throws, the process ends.
template <class T>
class Q_ScSetReset {
public:
    // Guards nothing until Arm is called.
    Q_ScSetReset() = default;
    explicit Q_ScSetReset(T* variable) { Arm(variable); }
    Q_ScSetReset(T* variable, T const& value) : Q_ScSetReset(variable) { *variable = value; }
    Q_ScSetReset(Q_ScSetReset const&) = delete;
    Q_ScSetReset& operator=(Q_ScSetReset const&) = delete;
    ~Q_ScSetReset() { Reset(); }

    // Remembers the present value of `variable`. What was guarded before is written back first.
    void Arm(T* variable)
    {
        Reset();
        guarded_.emplace(Guarded{variable, *variable});
    }
    // Writes the remembered value back now and guards nothing from here on.
    void Reset()
    {
        if (!guarded_) return;
        *guarded_->variable = std::move(guarded_->value);  // a move needs no memory
        guarded_.reset();
    }

private:
    struct Guarded {
        T* variable;
        T value;
    };
    std::optional<Guarded> guarded_;
};

namespace hearth::utility {
template <class T>
using ScSetReset = Q_ScSetReset<T>;
}
