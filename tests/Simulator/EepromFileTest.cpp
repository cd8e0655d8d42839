#include <gmock/gmock.h>

#include <stdexcept>

#include "EepromFile.h"
#include "EepromImageFile.h"
#include "FreshEeprom.h"
#include "PollLoop.h"
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
        const InstrumentSettings settings{.eeprom = file.Exists() ? ReadEepromFile(fileName_) : Bytes(),
                                          .memoryChanged = [&file] { file.MemoryChanged(); }};
        auto instrument = std::make_shared<SimulatedInstrument>(loop_, settings);
        file.Keep(instrument);
        return instrument;
    }
    static void WriteByte(const std::shared_ptr<SimulatedInstrument>& instrument, std::uint8_t address,
                          std::uint8_t value) {
        const auto device = SimulatedInstrument::Connect(instrument);
        Tests::Do(*device, TestTransfer::Memory(Request::WriteEeprom, address, 1));
        Tests::Do(*device, TestTransfer::Out(Protocol::BulkOutEndpoint, {value}));
    }

    const Tests::TestFolder folder_;
    const std::string fileName_ = folder_.Path("eeprom.bin");
    PollLoop loop_;
    std::vector<std::string> complaints_;
    const Log log_ = [this](const std::string& line) { complaints_.push_back(line); };
};

TEST_F(EepromFileTest, MemoryIsThereAgainAfterARestart) {
    Bytes expected = FreshEeprom();
    {
        EepromFile file(loop_, fileName_, log_);
        const auto instrument = MakeInstrument(file);
        EXPECT_EQ(expected, ReadEepromFile(fileName_)) << "it exists from the start";
        WriteByte(instrument, 8, expected[8] = 43);
        loop_.CallAt(loop_.Now() + 300'000, [this] { loop_.Stop(); });
        loop_.Run();
        EXPECT_EQ(expected, ReadEepromFile(fileName_)) << "and is written while the program runs";
        WriteByte(instrument, 9, expected[9] = 44);
        EXPECT_TRUE(file.Finish());
    }
    EepromFile file(loop_, fileName_, log_);
    EXPECT_EQ(expected, MakeInstrument(file)->Eeprom());
    EXPECT_EQ(1U, folder_.Files().size()) << "nothing else is left";
    EXPECT_TRUE(complaints_.empty());
}

TEST_F(EepromFileTest, UnusableFilesAreExplained) {
    for (const auto& [size, explanation] : {std::pair{0U, "has 0 bytes, but an EEPROM has 8192"},
                                            {8191U, "has 8191 bytes"},
                                            {8193U, "remove this one to begin with a fresh EEPROM"}}) {
        Tests::WriteFile(fileName_, Bytes(size));
        EXPECT_THAT([this] { ReadEepromFile(fileName_); },
                    testing::ThrowsMessage<std::runtime_error>(HasSubstr(explanation)));
    }
    EXPECT_THROW(ReadEepromFile(folder_.Path("none")), std::runtime_error);
}

TEST_F(EepromFileTest, FailureToWriteIsToldAndTheMemoryKept) {
    EepromFile file(loop_, folder_.Path("removed/eeprom.bin"), log_);
    const auto instrument = std::make_shared<SimulatedInstrument>(loop_);
    EXPECT_THROW(file.Keep(instrument), std::runtime_error) << "at the start a failure is an error";
    std::filesystem::create_directory(folder_.Path("removed"));
    file.Keep(instrument);
    std::filesystem::remove_all(folder_.Path("removed"));
    file.MemoryChanged();
    EXPECT_FALSE(file.Finish());
    ASSERT_EQ(1U, complaints_.size());
    EXPECT_THAT(complaints_.front(), HasSubstr("cannot write"));
    std::filesystem::create_directory(folder_.Path("removed"));
    EXPECT_TRUE(file.Finish());
    EXPECT_EQ(FreshEeprom(), ReadEepromFile(folder_.Path("removed/eeprom.bin")));
}

}  // namespace
}  // namespace Varnholt::Simulator
