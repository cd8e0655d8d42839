#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Memory/InputFile.h"
#include "Memory/MemoryTarget.h"
#include "Memory/NewFile.h"
#include "Output/Json.h"
#include "Protocol/EepromMap.h"
#include "Service/Memory/ImageEdit.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

struct GetBinaryOptions {
    MemoryOptions memory;
    NewFileOptions file;
};

void GetBinary(Session& session, const GetBinaryOptions& options) {
    const NewFile file(session, options.file);
    const MemoryTarget target(session, options.memory, MemoryTarget::Use::Read);
    const std::vector<std::uint8_t> block = BinaryBlockOf(target.Image());
    file.Write(block);
    if (options.memory.json) {
        session.Print({{"source", target.Name()}, {"file", options.file.name}, {"bytes", block.size()}});
    } else {
        session.Out() << block.size() << " bytes of " << target.Name() << " written to " << file.ShownName()
                      << '\n';
    }
}

struct PutBinaryOptions {
    MemoryOptions memory;
    ChangeOptions change;
    std::string file;
};

void PutBinary(Session& session, const PutBinaryOptions& options) {
    const std::vector<std::uint8_t> block =
        ReadFileOfSize(session, options.file, Protocol::EepromMap::BinarySize, "a binary block",
                       "`ostra binary get FILE` saves the one of an instrument");
    MemoryTarget target(session, options.memory, MemoryTarget::Use::Change);
    target.Change(WithBinaryBlock(target.Image(), block), options.change, Granularity::Elements,
                  {{"file", options.file}});
}

}  // namespace

void AddBinary(CommandSpec app, Session& session) {
    CommandSpec group = app.AddGroup("binary", "read and write the binary block of 1904 bytes");

    auto [get, getOptions] = NewCommand(group, session, "get", "save the binary block in a file", GetBinary);
    AddNewFileOptions(get, "FILE", getOptions.file);
    AddMemoryOptions(get, getOptions.memory);

    auto [put, putOptions] =
        NewCommand(group, session, "put", "write the binary block from a file", PutBinary);
    put.Add("FILE", putOptions.file, "1904 bytes; `-` is standard input").Required();
    AddChangeOptions(put, putOptions.change);
    AddMemoryOptions(put, putOptions.memory);
}

}  // namespace Varnholt::Cli
