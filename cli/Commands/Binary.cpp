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

struct GetOptions {
    MemoryOptions memory;
    NewFileOptions file;
};

void Get(Session& session, const GetOptions& options) {
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

struct PutOptions {
    MemoryOptions memory;
    ChangeOptions change;
    std::string file;
};

void Put(Session& session, const PutOptions& options) {
    const std::vector<std::uint8_t> block =
        ReadFileOfSize(session, options.file, Protocol::EepromMap::BinarySize, "a binary block",
                       "`ostra binary get FILE` saves the one of an instrument");
    MemoryTarget target(session, options.memory, MemoryTarget::Use::Change);
    const MemoryTarget::Outcome outcome =
        target.Change(WithBinaryBlock(target.Image(), block), options.change, Granularity::Elements);
    target.Report(outcome, options.memory.json, {{"file", options.file}});
}

}  // namespace

void AddBinary(CommandSpec app, Session& session) {
    CommandSpec group = app.AddGroup("binary", "read and write the binary block of 1904 bytes");

    const auto get = std::make_shared<GetOptions>();
    CommandSpec command = group.AddCommand("get", "save the binary block in a file");
    AddNewFileOptions(command, "FILE", get->file);
    AddMemoryOptions(command, get->memory);
    SetAction(command, session, get, Get);

    const auto put = std::make_shared<PutOptions>();
    command = group.AddCommand("put", "write the binary block from a file");
    command.Add("FILE", put->file, "1904 bytes; `-` is standard input").Required();
    AddChangeOptions(command, put->change);
    AddMemoryOptions(command, put->memory);
    SetAction(command, session, put, Put);
}

}  // namespace Varnholt::Cli
