#pragma once

#include "frame/services/reports.h"

#include <exception>
#include <type_traits>
#include <utility>

// The one door between throw and code. Runs the callable; an `int` that it throws is the result, a std::exception goes
// to Q_TranslateAndReportException, anything else propagates. A callable without a result answers 0.
template <class Body>
[[nodiscard]] [[gnu::always_inline]] inline int KFSp_Boundary(Body&& body)
{
    try {
        if constexpr (std::is_void_v<std::invoke_result_t<Body>>) {
            std::forward<Body>(body)();
            return 0;
        } else {
            return std::forward<Body>(body)();
        }
    } catch (int code) {
        return code;
    } catch (std::exception& exception) {
        return Q_TranslateAndReportException(exception);
    }
}

// Keeps the first code that isn't 0; later ones have no say.
class KFSp_FirstError {
public:
    void Keep(int code) noexcept
    {
        if (code_ == 0) code_ = code;
    }
    bool None() const noexcept { return code_ == 0; }
    [[nodiscard]] int Code() const noexcept { return code_; }

private:
    int code_ = 0;
};

// The class layer's form of an error code: throws it unless it is 0.
inline void KFSp_ThrowIf(int code)
{
    if (code != 0) throw code;
}
