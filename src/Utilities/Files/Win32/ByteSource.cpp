#include "Utilities/Files/ByteSource.h"

#include <windows.h>

#include <algorithm>
#include <system_error>

#include "Utilities/Files/FileError.h"

namespace Varnholt::Utilities::Files {
namespace {

class File final : public ByteSource {
  public:
    File(HANDLE openFile, bool isOwn, std::string name)
        : file_(openFile), owned_(isOwn), shownName_(std::move(name)) {
        if (file_ == INVALID_HANDLE_VALUE || file_ == nullptr) {
            Fail();
        }
    }
    ~File() override {
        if (owned_) {
            ::CloseHandle(file_);
        }
    }
    File(const File&) = delete;
    File& operator=(const File&) = delete;

    bool IsTerminal() const override {
        DWORD mode = 0;
        return ::GetConsoleMode(file_, &mode) != 0;
    }

    bool Wait(std::uint32_t milliseconds) override {
        // A pipe cannot be waited for: it is looked at from time to time.
        constexpr std::uint32_t lookEvery = 10;
        for (std::uint32_t waited = 0; ::GetFileType(file_) == FILE_TYPE_PIPE; waited += lookEvery) {
            DWORD available = 0;
            if (::PeekNamedPipe(file_, nullptr, 0, nullptr, &available, nullptr) == 0 || available > 0) {
                break;
            }
            if (waited >= milliseconds) {
                return false;
            }
            ::Sleep(std::min(lookEvery, milliseconds - waited));
        }
        return true;
    }

    std::size_t Read(std::uint8_t* buffer, std::size_t size) override {
        DWORD count = 0;
        // The end of a pipe is an error of its own.
        if (::ReadFile(file_, buffer, static_cast<DWORD>(size), &count, nullptr) == 0 &&
            ::GetLastError() != ERROR_BROKEN_PIPE) {
            Fail();
        }
        return count;
    }

  private:
    [[noreturn]] void Fail() const {
        const auto code = static_cast<int>(::GetLastError());
        throw FileError("cannot read " + shownName_ + ": " + std::system_category().message(code));
    }

    const HANDLE file_;
    const bool owned_;
    const std::string shownName_;
};

}  // namespace

std::unique_ptr<ByteSource> OpenByteSource(const std::string& name) {
    return std::make_unique<File>(
        ::CreateFileA(name.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr, OPEN_EXISTING,
                      0, nullptr),
        true, name);
}

std::unique_ptr<ByteSource> OpenStandardInput() {
    return std::make_unique<File>(::GetStdHandle(STD_INPUT_HANDLE), false, "standard input");
}

}  // namespace Varnholt::Utilities::Files
