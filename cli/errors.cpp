// The one place where what went wrong becomes a line for the user and an exit code.
#include "cli/errors.h"

#include "cli/command.h"
#include "cli/output.h"
#include "frame/services/reports.h"
#include "host/storeerror.h"

#include <cstdio>
#include <new>

namespace {

// It explains an error code, which alone says little.
std::string firstReport;

void RememberFirstReport(Q_Report const& report)
{
    if (firstReport.empty() && report.text) firstReport = report.text;
}

int Fail(std::string const& message)
{
    std::fprintf(stderr, "kfs: %s\n", Shown(message).c_str());
    return ExitFailed;
}

bool anyChanged = false;

}  // namespace

void TellAbout(std::string const& fileName, std::string const& what)
{
    std::fprintf(stderr, "kfs: %s: %s\n", kfshost::ShownFileName(fileName).c_str(), what.c_str());
}

void TellChanges(std::string const& fileName, kfshost::LoadNotes const& notes)
{
    for (std::string const& report : notes.reports) TellAbout(fileName, report);
    anyChanged = anyChanged || !notes.reports.empty();
}

void ListenToReports()
{
    Q_SetReportSink(RememberFirstReport);
}

int RunTold(std::function<int()> const& work)
try {
    int const code = work();
    return code == ExitDone && anyChanged ? ExitFound : code;
} catch (kfshost::StoreError const& error) {
    return Fail(firstReport.empty() ? error.what() : error.what() + (": " + firstReport));
} catch (std::bad_alloc const&) {
    return Fail("out of memory");
} catch (std::exception const& error) {
    return Fail(error.what());
}
