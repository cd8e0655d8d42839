#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "EepromFile.h"
#include "FreshEeprom.h"
#include "PollLoop.h"
#include "Protocol/Instrument.h"
#include "Support/TestFolder.h"
#include "Support/TestTransfer.h"

namespace Varnholt::Simulator {
namespace {

using Bytes = std::vector<std::uint8_t>;
using Protocol::Request;
using testing::HasSubstr;
using Tests::TestTransfer;

class EepromFileTest : public testing::Test {
  protected:
    std::shared_ptr<SimulatedInstrument> MakeInstrument(EepromFile& file) {
        InstrumentSettings settings;
        if (file.Exists()) {
            settings.eeprom = ReadEepromFile(fileName);
        }
        settings.memoryChanged = [&file] { file.MemoryChanged(); };
        auto instrument = std::make_shared<SimulatedInstrument>(loop, settings);
        file.Keep(instrument);
        return instrument;
    }
    static void WriteByte(SimulatedInstrument& instrument, std::uint8_t address, std::uint8_t value) {
        TestTransfer request = TestTransfer::Memory(Request::WriteEeprom, address, 1);
        TestTransfer data = TestTransfer::Out(Protocol::BulkOutEndpoint, {value});
        instrument.Submit(request);
        instrument.Submit(data);
        EXPECT_EQ(1, data.completions);
    }
    void RunLoopFor(std::uint64_t microseconds) {
        loop.CallAt(loop.Now() + microseconds, [this] { loop.Stop(); });
        loop.Run();
    }

    const Tests::TestFolder folder;
    const std::string fileName = folder.Path("eeprom.bin");
    PollLoop loop;
    std::vector<std::string> complaints;
    const Log log = [this](const std::string& line) { complaints.push_back(line); };
};

TEST_F(EepromFileTest, MemoryIsThereAgainAfterARestart) {
    {
        EepromFile file(loop, fileName, log);
        const auto instrument = MakeInstrument(file);
        EXPECT_EQ(FreshEeprom(), ReadEepromFile(fileName)) << "it exists from the start";
        WriteByte(*instrument, 7, 42);
        WriteByte(*instrument, 8, 43);
        RunLoopFor(300'000);
        EXPECT_EQ(43, ReadEepromFile(fileName)[8]) << "and is written while the program runs";
        WriteByte(*instrument, 9, 44);
        EXPECT_TRUE(file.Finish());
    }
    EepromFile file(loop, fileName, log);
    const auto instrument = MakeInstrument(file);
    Bytes expected = FreshEeprom();
    expected[7] = 42;
    expected[8] = 43;
    expected[9] = 44;
    EXPECT_EQ(expected, instrument->Eeprom());
    EXPECT_EQ(1U, folder.Files().size()) << "nothing else is left";
    EXPECT_TRUE(complaints.empty());
}

TEST_F(EepromFileTest, UnusableFilesAreExplained) {
    struct Case {
        std::size_t size;
        const char* explanation;
    };
    for (const Case& test : {Case{0, "has 0 bytes, but an EEPROM has 8192"}, Case{8191, "has 8191 bytes"},
                             Case{8193, "remove this one to begin with a fresh EEPROM"}}) {
        Tests::WriteFile(fileName, Bytes(test.size));
        try {
            ReadEepromFile(fileName);
            ADD_FAILURE() << test.size;
        } catch (const std::runtime_error& error) {
            EXPECT_THAT(error.what(), HasSubstr(test.explanation));
        }
    }
    EXPECT_THROW(ReadEepromFile(folder.Path("none")), std::runtime_error);
    EXPECT_THROW(ReadEepromFile(folder.Path("")), std::runtime_error);
}

TEST_F(EepromFileTest, AFileThatCannotBeWrittenIsRefusedAtTheStart) {
    const auto instrument = std::make_shared<SimulatedInstrument>(loop);
    const std::string longest(250, 'x');  // the new file beside it would have too long a name
    Tests::WriteFile(folder.Path(longest), FreshEeprom());
    for (const std::string& name : {std::string("missing/eeprom.bin"), longest}) {
        EepromFile file(loop, folder.Path(name), log);
        try {
            file.Keep(instrument);
            ADD_FAILURE() << name;
        } catch (const std::runtime_error& error) {
            EXPECT_THAT(error.what(), HasSubstr("cannot write " + folder.Path(name)));
        }
        file.MemoryChanged();
        EXPECT_FALSE(file.Finish());
    }
    EXPECT_EQ(FreshEeprom(), ReadEepromFile(folder.Path(longest)));
    EXPECT_EQ(1U, folder.Files().size());
}

TEST_F(EepromFileTest, FailureToWriteIsToldAndTheMemoryKept) {
    std::filesystem::create_directory(folder.Path("removed"));
    EepromFile file(loop, folder.Path("removed/eeprom.bin"), log);
    file.Keep(std::make_shared<SimulatedInstrument>(loop));
    std::filesystem::remove_all(folder.Path("removed"));
    file.MemoryChanged();
    EXPECT_FALSE(file.Finish());
    ASSERT_EQ(1U, complaints.size());
    EXPECT_THAT(complaints.front(), HasSubstr("cannot write"));
    std::filesystem::create_directory(folder.Path("removed"));
    EXPECT_TRUE(file.Finish());
    EXPECT_EQ(FreshEeprom(), ReadEepromFile(folder.Path("removed/eeprom.bin")));
}

}  // namespace
}  // namespace Varnholt::Simulator
