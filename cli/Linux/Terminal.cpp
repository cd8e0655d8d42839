#include "Terminal.h"

#include <fcntl.h>
#include <pthread.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cctype>
#include <cstdlib>
#include <string_view>
#include <thread>

#include "ExitCode.h"
#include "Utilities/Files/Linux/StandardStreams.h"

namespace Varnholt::Cli {
namespace {

std::string_view Environment(const char* name) {
    const char* const value = std::getenv(name);
    return value != nullptr ? value : "";
}

/// The variables that decide about characters, in their order of precedence; no locale is loaded.
bool EnvironmentSaysUtf8() {
    for (const char* name : {"LC_ALL", "LC_CTYPE", "LANG"}) {
        std::string value(Environment(name));
        if (value.empty()) {
            continue;
        }
        std::transform(value.begin(), value.end(), value.begin(),
                       [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; });
        return value.find("utf-8") != std::string::npos || value.find("utf8") != std::string::npos;
    }
    return false;
}

/// The usual size where the terminal does not say.
TerminalSize SizeOf(int descriptor) {
    TerminalSize size;
    winsize asked{};
    if (::ioctl(descriptor, TIOCGWINSZ, &asked) == 0 && asked.ws_col > 0) {
        size.columns = asked.ws_col;
        size.rows = asked.ws_row > 0 ? asked.ws_row : size.rows;
    }
    return size;
}

/// Of the signals that ask to end, those that whoever started the program (nohup, a shell's background) does
/// not want ignored. SIGTERM also ends the watching.
sigset_t WatchedSignals() {
    sigset_t signals;
    sigemptyset(&signals);
    sigaddset(&signals, SIGTERM);
    for (const int number : {SIGINT, SIGHUP}) {
        struct sigaction action {};
        if (::sigaction(number, nullptr, &action) == 0 && action.sa_handler != SIG_IGN) {
            sigaddset(&signals, number);
        }
    }
    return signals;
}

}  // namespace

void SecureStandardStreams() {
    Utilities::Files::SecureStandardStreams();
    static_cast<void>(::signal(SIGPIPE, SIG_IGN));
    static_cast<void>(::signal(SIGXFSZ, SIG_IGN));
}

StreamFacts FactsOf(Standard stream) {
    const int descriptor = static_cast<int>(stream);
    StreamFacts facts;
    facts.isTerminal = ::isatty(descriptor) != 0;
    facts.movesCursor = facts.isTerminal && Environment("TERM") != "dumb";
    facts.showsColor = facts.movesCursor && Environment("NO_COLOR").empty();
    facts.showsUtf8 = EnvironmentSaysUtf8();
    facts.size = [descriptor] { return SizeOf(descriptor); };
    return facts;
}

void SetStandardOutputBinary() {}

std::string QuotedFileName(const std::string& name) {
    std::string file = (name.starts_with('-') ? "./" : "") + name;
    const auto isPlain = [](unsigned char c) {
        return std::isalnum(c) != 0 ||
               std::string_view("_-./:=@%+,").find(static_cast<char>(c)) != std::string_view::npos;
    };
    if (!file.empty() && std::ranges::all_of(file, isPlain)) {
        return file;
    }
    std::string quoted = "'";
    for (const char c : file) {
        quoted += c == '\'' ? std::string("'\\''") : std::string(1, c);
    }
    return quoted + "'";
}

/// The signals are blocked in every thread and taken by one that waits for them: what it then calls may take
/// locks, which a signal handler may not.
struct SignalWatch::State {
    explicit State(std::function<void()> whenAsked) : callback(std::move(whenAsked)) {
        const sigset_t signals = WatchedSignals();
        ::pthread_sigmask(SIG_BLOCK, &signals, &maskBefore);
        thread = std::thread([this] { Run(); });
    }

    void Run() {
        const sigset_t signals = WatchedSignals();
        for (bool isFirst = true;; isFirst = false) {
            int number = 0;
            if (::sigwait(&signals, &number) != 0) {
                return;
            }
            if (ending) {
                return;
            }
            if (!isFirst) {
                ::_exit(static_cast<int>(ExitCode::Interrupted));
            }
            callback();
        }
    }

    const std::function<void()> callback;
    std::atomic<bool> ending{false};
    sigset_t maskBefore{};
    std::thread thread;
};

SignalWatch::SignalWatch(std::function<void()> whenAsked)
    : state_(std::make_unique<State>(std::move(whenAsked))) {}

SignalWatch::~SignalWatch() {
    state_->ending = true;
    // Blocked there, it only ends the wait for a signal.
    ::pthread_kill(state_->thread.native_handle(), SIGTERM);  // NOLINT(bugprone-bad-signal-to-kill-thread)
    state_->thread.join();
    ::pthread_sigmask(SIG_SETMASK, &state_->maskBefore, nullptr);
}

}  // namespace Varnholt::Cli
