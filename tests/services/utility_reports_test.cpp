#include "frame/services/memory.h"
#include "frame/services/reports.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <stdexcept>
#include <string>
#include <thread>
#include <tuple>
#include <utility>
#include <vector>

namespace {

using Row = std::tuple<Q_ReportKind, int, int, int, int, std::string>;  // kind, id, severity, code, line, text

// Records reports while it lives.
class Recorder {
public:
    Recorder()
    {
        previous_ = Q_SetReportSink([this](Q_Report const& report) {
            rows_.emplace_back(report.kind, report.id, report.severity, report.code, report.line,
                               report.text ? report.text : "<null>");
        });
    }
    ~Recorder() { Q_SetReportSink(previous_); }
    std::vector<Row> Take() { return std::exchange(rows_, {}); }

private:
    std::vector<Row> rows_;
    Q_ReportSink previous_;
};

TEST(Reports, CarryWhatTheCallerSaid)
{
    Recorder recorder;
    std::strcpy(Qp_GetThreadLoggingBuffer(), "formatted");
    Qp_ReportError(0x1D0017, 8);
    Qp_ReportErrString(0x1D0001, 4, "text");
    EXPECT_EQ(7446, Qp_ReportLegacyErrString(0x1D0000, 8, 7446, "unknown"));
    EXPECT_EQ(3, Qp_ReportLegacyErrString(0x1D0072, 8, 3, nullptr));
    Q_ReportError(0x1D000C, 4, Q_MBToUTF16String("\xC3\xA4"));
    Q_ReportFailedVerification(0x1D000A, 997, 0, "broken");
    EXPECT_EQ(4, Q_TranslateAndReportException(std::bad_array_new_length()));
    EXPECT_EQ(Q_Err_Exception, Q_TranslateAndReportException(std::runtime_error("what it was")));
    std::vector<Row> const wanted = {
        {Q_ReportKind::Message, 0x1D0017, 8, 0, 0, "formatted"},
        {Q_ReportKind::Message, 0x1D0001, 4, 0, 0, "text"},
        {Q_ReportKind::Message, 0x1D0000, 8, 7446, 0, "unknown"},
        {Q_ReportKind::Message, 0x1D0072, 8, 3, 0, "<null>"},
        {Q_ReportKind::Message, 0x1D000C, 4, 0, 0, "\xC3\xA4"},
        {Q_ReportKind::Verification, 0x1D000A, 8, 0, 997, "broken"},
        {Q_ReportKind::Exception, 0, 8, 4, 0, std::bad_array_new_length().what()},
        {Q_ReportKind::Exception, 0, 8, Q_Err_Exception, 0, "what it was"},
    };
    EXPECT_EQ(wanted, recorder.Take());
}

TEST(Reports, LastErrorAndBufferAreTheThreadsOwn)
{
    Qp_SetThreadLastError(7);
    std::strcpy(Qp_GetThreadLoggingBuffer(), "mine");
    std::memset(Qp_GetThreadLoggingBuffer() + 5, 'x', Q_LoggingBufferSize - 6);  // all of it may be written
    std::thread([] {
        EXPECT_EQ(0, Qp_GetThreadLastError());
        EXPECT_STREQ("", Qp_GetThreadLoggingBuffer());
        Qp_SetThreadLastError(8);
        std::strcpy(Qp_GetThreadLoggingBuffer(), "other");
    }).join();
    EXPECT_EQ(7, Qp_GetThreadLastError());
    EXPECT_STREQ("mine", Qp_GetThreadLoggingBuffer());
    Qp_SetThreadLastError(0);
}

TEST(Reports, ASinkMayThrowReportAndReplaceItself)
{
    int calls = 0;
    Q_ReportSink const previous = Q_SetReportSink([&calls, proof = std::string(100, 'x')](Q_Report const&) {
        ++calls;
        Q_SetReportSink({});
        Q_ReportFailedVerification(0, 1, 0, "from within");
        EXPECT_EQ(std::string(100, 'x'), proof) << "the closure is still there after its replacement";
        throw std::runtime_error("dropped");
    });
    testing::internal::CaptureStderr();
    Qp_ReportErrString(1, 8, "first");
    Qp_ReportErrString(0x1D0002, 8, "second");
    std::string const printed = testing::internal::GetCapturedStderr();
    Q_SetReportSink(previous);
    EXPECT_EQ(1, calls);
    EXPECT_EQ("failed verification 0x0 severity 8 code 0: from within\nreport 0x1D0002 severity 8 code 0: second\n",
              printed);
}

TEST(Reports, OneAtATimeReachesTheSink)
{
    int inside = 0, most = 0, calls = 0;  // unguarded on purpose: the thread sanitizer looks on
    Q_ReportSink const previous = Q_SetReportSink([&](Q_Report const&) {
        most = std::max(most, ++inside);
        ++calls;
        --inside;
    });
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i)
        threads.emplace_back([] {
            for (int k = 0; k < 500; ++k) Qp_ReportErrString(1, 8, "busy");
        });
    for (std::thread& thread : threads) thread.join();
    Q_SetReportSink(previous);
    EXPECT_EQ(1, most);
    EXPECT_EQ(2000, calls);
}

TEST(Log, GoesToItsSinkOrNowhere)
{
    std::vector<std::string> lines;
    XLOG_Log(10, "KFS", "Birth", "before");
    Q_LogSink const previous = Q_SetLogSink([&](int level, char const* tag, char const* topic, char const* text) {
        lines.push_back(std::to_string(level) + "|" + tag + "|" + topic + "|" + text);
        XLOG_Log(0, "KFS", "again", "and again");
        if (lines.size() == 2) throw 5;
    });
    XLOG_Log(10, "KFS", "Birth", "KFS Birth");
    XLOG_Log(0, nullptr, nullptr, nullptr);
    Q_SetLogSink(previous);
    XLOG_Log(10, "KFS", "Death", "after");
    EXPECT_EQ((std::vector<std::string>{"10|KFS|Birth|KFS Birth", "0|||"}), lines);
}

}  // namespace
