#include "cli/signals.h"

#include "frame/services/filewriter.h"

#include <csignal>
#include <string_view>

#include <unistd.h>

namespace {

// Only what may be called in a handler. The signal then ends the process as if there were no handler, so that whoever
// started it sees the reason.
void EndBySignal(int number)
{
    CKF_RemoveTemporaries();
    std::string_view const text = number == SIGINT ? "kfs: interrupted; no file was left half written\n"
                                                   : "kfs: ended by a signal; no file was left half written\n";
    [[maybe_unused]] ssize_t const ignored = write(STDERR_FILENO, text.data(), text.size());
    std::raise(number);
}

}  // namespace

void TellOfSignals()
{
    std::signal(SIGXFSZ, SIG_IGN);
    for (int const number : {SIGINT, SIGTERM, SIGHUP, SIGQUIT}) {
        struct sigaction action = {};
        if (sigaction(number, nullptr, &action) != 0 || action.sa_handler == SIG_IGN) continue;
        action = {};
        action.sa_handler = EndBySignal;
        action.sa_flags = static_cast<int>(SA_RESETHAND);  // the second time it ends the process
        sigaction(number, &action, nullptr);
    }
}
