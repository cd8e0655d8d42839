#include "Terminal.h"

#include <fcntl.h>
#include <io.h>
#include <windows.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>

#include "ExitCode.h"

namespace Varnholt::Cli {
namespace {

/// The usual size where there is no console.
TerminalSize SizeOf(HANDLE stream) {
    TerminalSize size;
    CONSOLE_SCREEN_BUFFER_INFO info{};
    if (::GetConsoleScreenBufferInfo(stream, &info) != 0) {
        size.columns = info.srWindow.Right - info.srWindow.Left + 1;
        size.rows = info.srWindow.Bottom - info.srWindow.Top + 1;
    }
    return size;
}

}  // namespace

void SecureStandardStreams() {}  // the run-time library opens none in their place

StreamFacts FactsOf(Standard which) {
    StreamFacts facts;
    const HANDLE stream = ::GetStdHandle(which == Standard::Output ? STD_OUTPUT_HANDLE : STD_ERROR_HANDLE);
    DWORD mode = 0;
    facts.isTerminal = ::GetConsoleMode(stream, &mode) != 0;
    // Drawing and colours need a console that understands escape sequences (0x0004), which old ones do not.
    constexpr DWORD escapeSequences = 0x0004;
    facts.movesCursor = facts.isTerminal && ::SetConsoleMode(stream, mode | escapeSequences) != 0;
    const char* const noColor = std::getenv("NO_COLOR");
    facts.showsColor = facts.movesCursor && (noColor == nullptr || *noColor == '\0');
    facts.showsUtf8 = ::GetConsoleOutputCP() == CP_UTF8;
    facts.size = [stream] { return SizeOf(stream); };
    return facts;
}

void SetStandardOutputBinary() {
    ::_setmode(::_fileno(stdout), _O_BINARY);
}

std::string QuotedFileName(const std::string& name) {
    const std::string file = (name.starts_with('-') ? ".\\" : "") + name;
    const bool isPlain = !file.empty() && file.find_first_of(" \t&|<>()^%!,;='`") == std::string::npos;
    return isPlain ? file : '"' + file + '"';
}

/// The console calls its handler on a thread of its own.
struct SignalWatch::State {
    std::function<void()> callback;
    std::atomic<bool> asked{false};

    static State* current;
    static BOOL WINAPI Handle(DWORD) {
        if (current == nullptr) {
            return FALSE;
        }
        if (current->asked.exchange(true)) {
            ::ExitProcess(static_cast<UINT>(ExitCode::Interrupted));
        }
        current->callback();
        return TRUE;
    }
};
SignalWatch::State* SignalWatch::State::current = nullptr;

SignalWatch::SignalWatch(std::function<void()> whenAsked) : state_(std::make_unique<State>()) {
    state_->callback = std::move(whenAsked);
    State::current = state_.get();
    ::SetConsoleCtrlHandler(&State::Handle, TRUE);
}

SignalWatch::~SignalWatch() {
    ::SetConsoleCtrlHandler(&State::Handle, FALSE);
    State::current = nullptr;
}

}  // namespace Varnholt::Cli
