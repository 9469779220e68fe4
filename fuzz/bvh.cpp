// A motion capture file: imported, saved and loaded. A file is an ImportError or a scene, whatever stands in it.

#include "frame/services/reports.h"
#include "host/import.h"
#include "host/import_error.h"
#include "host/projectfile.h"
#include "host/session.h"

#include <cstdint>

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size)
{
    kfshost::Session const session;  // one a run, so that nothing outlives it
    static Q_ReportSink const stderrSink = Q_SetReportSink([](Q_Report const&) {});

    try {
        kfshost::Scene scene = kfshost::ImportBvhFromMemory({reinterpret_cast<char const*>(data), size}, "fuzzed.bvh");
        auto const tree = kfshost::MakeTree(std::move(scene));
        kfshost::LoadProjectFromMemory(kfshost::SaveProjectToMemory(*tree, "saved"), "saved");
    } catch (kfshost::ImportError const&) {  // an answer
    }
    return 0;
}
