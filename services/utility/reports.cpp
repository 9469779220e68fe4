#include "frame/services/reports.h"

#include <atomic>
#include <cstdio>
#include <memory>
#include <mutex>
#include <new>
#include <string>

namespace {

thread_local int lastError = 0;
thread_local std::unique_ptr<char[]> loggingBuffer;  // made when it is first asked for: static TLS is scarce
thread_local bool inReport = false;
thread_local bool inLog = false;

std::atomic<int> runMode{0};

// A function that outside code may replace at any time, also from within a call of it. Never destroyed, since static
// objects of the host may report while they go.
template <class Func>
class Sink {
public:
    Func Exchange(Func next)
    {
        auto shared = next ? std::make_shared<Func>(std::move(next)) : nullptr;
        {
            std::lock_guard<std::recursive_mutex> const lock(mutex_);
            func_.swap(shared);
            isSet_.store(func_ != nullptr, std::memory_order_relaxed);
        }
        return shared ? *shared : Func();
    }

    // Calls the function and says whether there was one. What it throws ends here.
    template <class... Arguments>
    bool Call(Arguments const&... arguments) noexcept
    {
        if (!isSet_.load(std::memory_order_relaxed)) return false;
        try {
            std::lock_guard<std::recursive_mutex> const lock(mutex_);
            std::shared_ptr<Func> const func = func_;  // outlives its replacement by itself
            if (!func) return false;
            (*func)(arguments...);
        } catch (...) {
            // Whoever reports has an error of its own to deal with.
        }
        return true;
    }

private:
    std::recursive_mutex mutex_;
    std::shared_ptr<Func> func_;
    std::atomic<bool> isSet_{false};
};

Sink<Q_ReportSink>& ReportSink()
{
    static Sink<Q_ReportSink>* const sink = new Sink<Q_ReportSink>;
    return *sink;
}

Sink<Q_LogSink>& LogSink()
{
    static Sink<Q_LogSink>* const sink = new Sink<Q_LogSink>;
    return *sink;
}

// Marks that the thread is in a sink, so that a sink's own reports don't come back to it.
class ScInSink {
public:
    explicit ScInSink(bool& flag) noexcept : flag_(flag) { flag_ = true; }
    ScInSink(ScInSink const&) = delete;
    ScInSink& operator=(ScInSink const&) = delete;
    ~ScInSink() { flag_ = false; }

private:
    bool& flag_;
};

char const* KindName(Q_ReportKind kind) noexcept
{
    switch (kind) {
    case Q_ReportKind::Verification: return "failed verification";
    case Q_ReportKind::Exception: return "exception";
    case Q_ReportKind::Message: break;
    }
    return "report";
}

void PrintReport(Q_Report const& report) noexcept
{
    std::fprintf(stderr, "%s 0x%X severity %d code %d: %s\n", KindName(report.kind), static_cast<unsigned>(report.id),
                 report.severity, report.code, report.text ? report.text : "(no text)");
}

void Send(Q_Report const& report) noexcept
{
    if (!inReport) {
        ScInSink const mark(inReport);
        if (ReportSink().Call(report)) return;
    }
    PrintReport(report);
}

}  // namespace

Q_ReportSink Q_SetReportSink(Q_ReportSink sink)
{
    return ReportSink().Exchange(std::move(sink));
}

void Qp_SetThreadLastError(int error) noexcept
{
    lastError = error;
}

int Qp_GetThreadLastError() noexcept
{
    return lastError;
}

char* Qp_GetThreadLoggingBuffer() noexcept
{
    if (!loggingBuffer) loggingBuffer.reset(new (std::nothrow) char[Q_LoggingBufferSize]{});
    // Without memory a message may be garbled by that of another thread, but it is told.
    static char shared[Q_LoggingBufferSize];
    return loggingBuffer ? loggingBuffer.get() : shared;
}

void Qp_ReportError(int id, int severity) noexcept
{
    Qp_ReportErrString(id, severity, Qp_GetThreadLoggingBuffer());
}

void Qp_ReportErrString(int id, int severity, char const* text) noexcept
{
    static_cast<void>(Qp_ReportLegacyErrString(id, severity, 0, text));  // its answer is the code, which is 0
}

int Qp_ReportLegacyErrString(int id, int severity, int code, char const* text) noexcept
{
    Send({.id = id, .severity = severity, .code = code, .text = text});
    return code;
}

void Q_ReportError(int id, int severity, u16str const& text) noexcept
{
    try {
        Qp_ReportErrString(id, severity, Q_UTF16ToMBString(text).c_str());
    } catch (std::bad_alloc const&) {
        Qp_ReportErrString(id, severity, nullptr);  // that it happened matters more than its text
    }
}

void Q_ReportFailedVerification(int id, int line, int code, char const* text) noexcept
{
    Send({.kind = Q_ReportKind::Verification, .id = id, .code = code, .line = line, .text = text});
}

int Q_TranslateAndReportException(std::exception const& exception) noexcept
{
    bool const isMemory = dynamic_cast<std::bad_alloc const*>(&exception) != nullptr;
    int const code = isMemory ? Q_Err_OutOfMemory : Q_Err_Exception;
    Send({.kind = Q_ReportKind::Exception, .code = code, .text = exception.what()});
    return code;
}

Q_LogSink Q_SetLogSink(Q_LogSink sink)
{
    return LogSink().Exchange(std::move(sink));
}

void XLOG_Log(int level, char const* tag, char const* topic, char const* text) noexcept
{
    if (inLog) return;
    ScInSink const mark(inLog);
    auto const orEmpty = [](char const* part) { return part ? part : ""; };
    LogSink().Call(level, orEmpty(tag), orEmpty(topic), orEmpty(text));
}

int Q_GetRunMode() noexcept
{
    return runMode.load(std::memory_order_relaxed);
}

void Q_SetRunMode(int mode) noexcept
{
    runMode.store(mode, std::memory_order_relaxed);
}
