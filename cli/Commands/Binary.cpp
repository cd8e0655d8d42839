#include <fmt/format.h>

#include "Commands/AllCommands.h"
#include "Memory/InputFile.h"
#include "Memory/MemoryTarget.h"
#include "Memory/NewFile.h"
#include "Protocol/EepromMap.h"
#include "Service/Memory/ImageEdit.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

struct GetBinaryOptions : MemoryOptions {
    NewFileOptions file;
};

void GetBinary(Session& session, const GetBinaryOptions& options) {
    const NewFile file(session, options.file);
    const MemoryTarget target(session, options, MemoryTarget::Use::Read);
    const std::vector<std::uint8_t> block = BinaryBlockOf(target.Image());
    file.Write(block);
    session.Print(
        options.json, {{"source", target.Name()}, {"file", options.file.name}, {"bytes", block.size()}},
        fmt::format("{} bytes of {} written to {}\n", block.size(), target.Name(), file.ShownName()));
}

struct PutBinaryOptions : MemoryOptions {
    ChangeOptions change;
    std::string file;
};

void PutBinary(Session& session, const PutBinaryOptions& options) {
    const std::vector<std::uint8_t> block =
        ReadFileOfSize(session, options.file, Protocol::EepromMap::BinarySize, "a binary block",
                       "`ostra binary get FILE` saves the one of an instrument");
    MemoryTarget target(session, options, MemoryTarget::Use::Change);
    target.Change(WithBinaryBlock(target.Image(), block), options.change, Granularity::Elements,
                  {{"file", options.file}});
}

}  // namespace

void AddBinary(CommandSpec app, Session& session) {
    CommandSpec group = app.AddGroup("binary", "read and write the binary block of 1904 bytes");

    auto [get, getOptions] = NewCommand(group, session, "get", "save the binary block in a file", GetBinary);
    AddNewFileOptions(get, "FILE", getOptions.file);
    AddMemoryOptions(get, getOptions);

    auto [put, putOptions] =
        NewCommand(group, session, "put", "write the binary block from a file", PutBinary);
    put.Add("FILE", putOptions.file, "1904 bytes; `-` is standard input", {.isRequired = true});
    AddChangeOptions(put, putOptions.change);
    AddMemoryOptions(put, putOptions);
}

}  // namespace Varnholt::Cli
