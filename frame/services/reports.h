// Reports of errors, broken invariants and life-cycle events.
//
// A report never fails and never throws into its caller: what a sink throws is dropped. Ids are (operation) | 0x1D0000
// for reports of the animation store. Texts are UTF-8.
//
// Threads: any. The last error and the logging buffer are the thread's own. One report at a time goes to the sink, on
// the thread that reports, so a sink needs no lock of its own.
#pragma once

#include "frame/services/export.h"
#include "frame/services/strings.h"

#include <exception>
#include <functional>

inline constexpr int Q_SeverityError = 8;
inline constexpr int Q_SeverityWarning = 4;

// The code of an exception that isn't about memory.
inline constexpr int Q_Err_Exception = 0x1702;

enum class Q_ReportKind {
    Message,       // from Qp_ReportError, Qp_ReportErrString, Qp_ReportLegacyErrString, Q_ReportError
    Verification,  // from Q_ReportFailedVerification
    Exception,     // from Q_TranslateAndReportException
};

struct Q_Report {
    Q_ReportKind kind = Q_ReportKind::Message;
    int id = 0;
    int severity = Q_SeverityError;
    int code = 0;                // where the report carries one; else 0
    int line = 0;                // of a failed verification; else 0
    char const* text = nullptr;  // null where only a code was reported; valid during the call of the sink
};

// Sets where reports go and returns what was there. An empty function stands for the default: one line on stderr.
// A report that a sink makes itself goes to stderr.
using Q_ReportSink = std::function<void(Q_Report const&)>;
KFS_SERVICE_API Q_ReportSink Q_SetReportSink(Q_ReportSink sink);

// ---- the thread's last error and buffer

KFS_SERVICE_API void Qp_SetThreadLastError(int error) noexcept;
KFS_SERVICE_API int Qp_GetThreadLastError() noexcept;

// A buffer of Q_LoggingBufferSize bytes, empty at first, for a message to be formatted into.
inline constexpr int Q_LoggingBufferSize = 1024;
KFS_SERVICE_API char* Qp_GetThreadLoggingBuffer() noexcept;

// ---- reports

// Reports what stands in the thread's buffer.
KFS_SERVICE_API void Qp_ReportError(int id, int severity) noexcept;
// Reports a text.
KFS_SERVICE_API void Qp_ReportErrString(int id, int severity, char const* text) noexcept;
// Reports a code with a text, or with a null text the code alone, and returns the code.
[[nodiscard]] KFS_SERVICE_API int Qp_ReportLegacyErrString(int id, int severity, int code, char const* text) noexcept;
// Reports a text.
KFS_SERVICE_API void Q_ReportError(int id, int severity, u16str const& text) noexcept;
// Reports a broken invariant with severity 8, and returns: the caller goes on. `code` is 0.
KFS_SERVICE_API void Q_ReportFailedVerification(int id, int line, int code, char const* text) noexcept;
// Reports what() with severity 8 and returns the code for the exception: 4 for std::bad_alloc, else Q_Err_Exception.
[[nodiscard]] KFS_SERVICE_API int Q_TranslateAndReportException(std::exception const& exception) noexcept;

// ---- log

// A line for whoever sets a log sink; without one, lines are dropped at the price of a load. A null text is empty. A
// line that a log sink writes itself is dropped.
using Q_LogSink = std::function<void(int level, char const* tag, char const* topic, char const* text)>;
KFS_SERVICE_API Q_LogSink Q_SetLogSink(Q_LogSink sink);
KFS_SERVICE_API void XLOG_Log(int level, char const* tag, char const* topic, char const* text) noexcept;

// ---- run mode

// The application's run mode, 0 at first. In mode 2 streams send no notifications.
inline constexpr int Q_RunMode_Silent = 2;
KFS_SERVICE_API int Q_GetRunMode() noexcept;
KFS_SERVICE_API void Q_SetRunMode(int mode) noexcept;
