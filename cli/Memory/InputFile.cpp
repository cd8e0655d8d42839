#include "Memory/InputFile.h"

#include <filesystem>

#include "Protocol/Instrument.h"
#include "Session.h"
#include "Utilities/Files/ByteSource.h"

namespace Varnholt::Cli {
namespace {

using Utilities::Files::ByteSource;

/// Returns when there is something to read.
void Await(Session& session, ByteSource& source, const std::string& name) {
    constexpr std::uint32_t lookEvery = 50;  // milliseconds
    for (std::uint32_t waited = 0; !source.Wait(lookEvery); waited += lookEvery) {
        session.UserInterruption().ThrowIfRequested();
        if (waited >= session.InputPatience()) {
            throw Failure(FailureKind::File, "nothing comes from " + ShownSource(name),
                          "whatever writes into it must do so while this command runs");
        }
    }
    session.UserInterruption().ThrowIfRequested();
}

/// At most one byte more than `limit`: that many are too many.
std::vector<std::uint8_t> ReadFileUpTo(Session& session, const std::string& name, std::size_t limit) {
    std::error_code error;
    if (name == StandardStream) {
        session.ClaimIn();
    } else if (std::filesystem::is_directory(name, error)) {
        throw Failure(FailureKind::File, "cannot read " + name + ": it is a directory");
    }
    const std::unique_ptr<ByteSource> source = name == StandardStream
                                                   ? Utilities::Files::OpenStandardInput()
                                                   : Utilities::Files::OpenByteSource(name);
    if (source->IsTerminal()) {
        throw Failure(FailureKind::BadArgument, ShownSource(name) + " is a terminal: nobody types raw bytes",
                      "name a file, or let a pipe bring it");
    }
    return Utilities::Files::ReadUpTo(*source, limit, [&] { Await(session, *source, name); });
}

}  // namespace

std::string ShownSource(const std::string& name) {
    return name == StandardStream ? "standard input" : name;
}

std::string QuotedSource(const std::string& name) {
    return name == StandardStream ? name : QuotedFileName(name);
}

std::vector<std::uint8_t> ReadFileOfSize(Session& session, const std::string& name, std::size_t size,
                                         const std::string& what, const std::string& advice) {
    std::vector<std::uint8_t> content = ReadFileUpTo(session, name, size);
    if (content.size() != size) {
        const std::string found =
            content.size() > size ? "more than " + std::to_string(size) + " bytes"
                                  : std::to_string(content.size()) + " bytes, not " + std::to_string(size);
        throw Failure(FailureKind::BadData, ShownSource(name) + " is not " + what + ": it has " + found,
                      advice);
    }
    return content;
}

void AddImageArgument(CommandSpec command, std::string& file) {
    command.Add("--image,FILE", file, "image of 8192 bytes; `-` is standard input",
                {.type = "FILE", .isRequired = true});
}

Service::EepromImage ReadImageFile(Session& session, const std::string& name) {
    return ReadFileOfSize(
        session, name, Protocol::EepromSize, "an EEPROM image",
        "`ostra eeprom backup FILE` makes one from an instrument, `ostra eeprom new FILE` a fresh one");
}

}  // namespace Varnholt::Cli
