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

    const auto get = std::make_shared<GetBinaryOptions>();
    CommandSpec command = group.AddCommand("get", "save the binary block in a file");
    AddNewFileOptions(command, "FILE", get->file);
    AddMemoryOptions(command, get->memory);
    SetAction(command, session, get, GetBinary);

    const auto put = std::make_shared<PutBinaryOptions>();
    command = group.AddCommand("put", "write the binary block from a file");
    command.Add("FILE", put->file, "1904 bytes; `-` is standard input").Required();
    AddChangeOptions(command, put->change);
    AddMemoryOptions(command, put->memory);
    SetAction(command, session, put, PutBinary);
}

}  // namespace Varnholt::Cli
