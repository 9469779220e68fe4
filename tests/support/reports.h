#pragma once

#include "frame/services/reports.h"

#include <gtest/gtest.h>

#include <mutex>
#include <ostream>
#include <string>
#include <vector>

// One report as a test sees it.
struct Reported {
    int id = 0;
    int severity = 0;
    std::string text;  // empty where only a code was reported
    int code = 0;

    bool operator==(Reported const&) const = default;
    friend std::ostream& operator<<(std::ostream& out, Reported const& report)
    {
        return out << std::hex << "0x" << report.id << std::dec << " severity " << report.severity << " code "
                   << report.code << " \"" << report.text << '"';
    }
};

// What the key store reports for an operation's number: severity 8, no code.
inline Reported KfsReport(int operation, std::string text)
{
    return {operation | 0x1D0000, 8, std::move(text), 0};
}

// Takes all reports for its scope. Whatever a test doesn't take with Take() is a failure at the end, so an unexpected
// report never goes unseen. Reports may come from any thread.
class ReportRecorder {
public:
    ReportRecorder()
        : previous_(Q_SetReportSink([this](Q_Report const& report) {
              std::lock_guard const guard(mutex_);
              seen_.push_back({report.id, report.severity, report.text ? report.text : "", report.code});
          }))
    {}
    ~ReportRecorder()
    {
        Q_SetReportSink(previous_);
        for (Reported const& report : seen_) ADD_FAILURE() << "unexpected report: " << report;
    }
    ReportRecorder(ReportRecorder const&) = delete;
    ReportRecorder& operator=(ReportRecorder const&) = delete;

    // All reports since the last call, in order.
    std::vector<Reported> Take()
    {
        std::lock_guard const guard(mutex_);
        return std::exchange(seen_, {});
    }

private:
    std::mutex mutex_;
    std::vector<Reported> seen_;
    Q_ReportSink previous_;
};

// The only report since the last Take(), or a failure.
#define EXPECT_REPORT(recorder, operation, text)                                                                       \
    EXPECT_EQ((recorder).Take(), std::vector<Reported>{KfsReport(operation, text)})
#define EXPECT_NO_REPORT(recorder) EXPECT_EQ((recorder).Take(), std::vector<Reported>{})
