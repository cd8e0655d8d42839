// The library of simulated instruments as a host uses it. The setup is read with the first call of the
// process.
#include <gmock/gmock.h>

#include <array>
#include <cstdlib>
#include <stdexcept>

#include "ostra.h"
#include "SimulatedSetup.h"
#include "Support/Bytes.h"
#include "Support/TestFolder.h"

namespace Varnholt::Simulator {
namespace {

using Values = std::array<std::int32_t, OSTRA_READOUT_VALUES>;

#ifdef _WIN32
const std::string Way = "native/simulated-";
void SetVariable(const char* name, const std::string& value) {
    _putenv_s(name, value.c_str());
}
constexpr const char* Time = "time=real ";
#else
const std::string Way = "usbio/simulated-";
void SetVariable(const char* name, const std::string& value) {
    setenv(name, value.c_str(), 1);
}
constexpr const char* Time = "time=virtual ";  // forty seconds of time-outs take none
#endif

std::string ReadoutOf(const std::string& name, Values& values) {
    const std::int32_t code = d4fb86cecc88582a(values.data(), name.c_str());
    return code == OSTRA_OK ? "" : b5ae189db26b2a1b("LastError");
}

TEST(SimulatedLibrary, ServesAHostFromTheSetupInTheEnvironment) {
    const Tests::TestFolder folder;
    const std::string memory = folder.Path("memory.bin");
    const std::string setup = folder.Path("setup");
    std::ofstream(setup)
        << Time << "# three instruments\nname=lamp light=30 gain=0.1 eeprom=" << memory
        << "\nname=dim light=2 gain=0.05\nname=mute faults=\"bulk-in 0+:stall; bulk-out 3+:stall\"\n";
    SetVariable("OSTRA_SIMULATED", "@" + folder.Path("none"));
    Values lamp{};
    EXPECT_EQ("OSTRA_SIMULATED: " + folder.Path("none") + " cannot be read", ReadoutOf("", lamp));

    SetVariable("OSTRA_SIMULATED", "@" + setup);
    ASSERT_EQ("", ReadoutOf(Way + "lamp", lamp)) << "a setup that was wrong is read again";
    Values again{};
    ASSERT_EQ("", ReadoutOf(Way + "lamp", again));
    EXPECT_NE(lamp, again) << "the noise goes on";
    EXPECT_EQ(60000, *std::ranges::max_element(lamp)) << "saturated";
    Values dim{};
    ASSERT_EQ("", ReadoutOf(Way + "dim", dim));
    EXPECT_LT(*std::ranges::max_element(dim), 6000);
    EXPECT_NE("", ReadoutOf(Way + "mute", dim)) << "the driver's text of what went wrong";
    Values none{};
    EXPECT_EQ("", ReadoutOf(Way + "other", none)) << "no text: there is none";
    EXPECT_EQ(Values{}, none);

    const Tests::Bytes image = Tests::CountingImage();
    ASSERT_EQ(OSTRA_OK, f3355d91d5df0e0b(image.data(), (Way + "lamp").c_str()));
    EXPECT_EQ(image, Tests::ReadFile(memory));
    EXPECT_EQ(OSTRA_UNKNOWN_FAILURE, f3355d91d5df0e0b(image.data(), (Way + "mute").c_str()));
}

TEST(SimulatedSetup, SaysWhatIsWrong) {
    const std::array<std::array<const char*, 2>, 8> rows{{
        {"lamp", "lamp: KEY=VALUE is wanted"},
        {"light=1x", "light=1x: a number from 0 is wanted"},
        {"seed=nan", "seed=nan: a number from 0 is wanted"},
        {"name=a/b", "name=a/b: a name of its own is wanted, without slash and backslash"},
        {"name=a name=a", "name=a: a name of its own is wanted, without slash and backslash"},
        {"light=1 name=a", "name=a: it stands before the words of its instrument"},
        {"name=\"a b", "name=a b: the quotes do not end"},
        {"time=soon", "time=soon: real or virtual is wanted"},
    }};
    for (const auto& [text, message] : rows) {
        EXPECT_THAT([text = text] { SimulatedSetup::Parse(text); },
                    testing::ThrowsMessage<std::runtime_error>(message));
    }
    const SimulatedSetup setup = SimulatedSetup::Parse("seed=5 firmware=old integrate=yes");
    ASSERT_EQ(1U, setup.instruments.size());
    EXPECT_EQ("1", setup.instruments[0].name);
    EXPECT_EQ(5U, setup.instruments[0].settings.seed);
    EXPECT_EQ(OldFirmware, setup.instruments[0].settings.firmware);
    EXPECT_TRUE(setup.instruments[0].settings.takesIntegrationTime);
    EXPECT_FALSE(setup.isTimeVirtual);
}

}  // namespace
}  // namespace Varnholt::Simulator
