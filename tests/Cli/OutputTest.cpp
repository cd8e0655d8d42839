#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <sstream>

#include "Failure.h"
#include "Output/AtomicFile.h"
#include "Output/Json.h"
#include "Output/Plot.h"
#include "Output/Progress.h"
#include "Output/Table.h"
#include "Support/ExpectThrow.h"
#include "ToolFixture.h"

namespace Varnholt::Tests {
namespace {

using namespace Cli;

TEST(TableTest, ColumnsAreAsWideAsTheirWidestCellAndLinesEndWithoutBlanks) {
    Table table({{"NAME"}, {"VALUE", Table::Align::Right}, {"NOTE"}});
    table.AddRow({"a", "1", ""});
    table.AddRow({"longer", "12345678", "x"});
    table.AddRow({"é"});
    std::ostringstream out;
    table.Print(out);
    EXPECT_EQ(out.str(),
              "NAME       VALUE  NOTE\n"
              "a              1\n"
              "longer  12345678  x\n"
              "é\n");
}

std::string Plot(const std::vector<double>& values, bool braille, int width = 60, int height = 4) {
    std::ostringstream out;
    PrintPlot(out, values, {braille, width, height, ""});
    return out.str();
}

TEST(PlotTest, AsciiRampRisesFromLeftToRight) {
    EXPECT_EQ(Plot({0, 1, 2, 3}, false),
              "3 +   *\n"
              "  |  *\n"
              "1 + *\n"
              "0 +*\n"
              "  ++---\n"
              "   0\n")
        << Plot({0, 1, 2, 3}, false);
}

TEST(PlotTest, BrailleUsesTwoByFourDots) {
    // Eight values in four characters: two dots for each value's step of the ramp, from bottom left to top
    // right.
    EXPECT_EQ(Plot({0, 1, 2, 3, 4, 5, 6, 7}, true, 60, 2),
              "7 ┤  ⡠⠊\n"
              "0 ┤⡠⠊\n"
              "  └┬───\n"
              "   0\n")
        << Plot({0, 1, 2, 3, 4, 5, 6, 7}, true, 60, 2);
}

TEST(PlotTest, AlwaysHasAsManyLinesAsItSays) {
    const double nan = std::numeric_limits<double>::quiet_NaN();
    const double huge = std::numeric_limits<double>::max();
    for (const std::vector<double>& values : std::vector<std::vector<double>>{
             {}, {5}, {5, 5, 5}, {nan, nan}, {1, nan, 3}, {-huge, huge}, {nan, INFINITY, -INFINITY}}) {
        for (const int width : {-5, 0, 20, 200}) {
            for (const bool braille : {false, true}) {
                const std::string text = Plot(values, braille, width, 5);
                EXPECT_EQ(std::count(text.begin(), text.end(), '\n'), PlotLines({braille, width, 5, ""}))
                    << testing::PrintToString(values);
            }
        }
    }
}

TEST(PlotTest, ManyValuesFitIntoTheWidth) {
    std::vector<double> values(1000);
    values[997] = 9;  // a spike is not lost by drawing several values in one column
    std::istringstream lines(Plot(values, false, 40));
    std::string top;
    std::getline(lines, top);
    EXPECT_NE(top.find('*'), std::string::npos);
    for (std::string line; std::getline(lines, line);) {
        EXPECT_LE(line.size(), 44u);
    }
}

TEST(JsonTest, FloatsHaveTheDigitsThatTheyNeedAndTextsAreValid) {
    std::ostringstream out;
    PrintJson(out, {{"a", JsonOf(0.068F)}, {"b", JsonOf(-1.0F)}, {"c", JsonOf(1e-30F)}, {"d", JsonOf(NAN)}});
    EXPECT_EQ(out.str(), "{\"a\":0.068,\"b\":-1.0,\"c\":1e-30,\"d\":null}\n");
    out.str({});
    PrintJson(out, {{"path", "x\xFFy"}});
    EXPECT_TRUE(nlohmann::json::accept(out.str())) << out.str();
}

TEST(ProgressTest, Lines) {
    struct Case {
        std::uint64_t done, total;
        const char* unit;
        double seconds;
        const char* line;
    };
    for (const Case& row : {
             Case{0, 32, "pieces", 0, "w  [                        ]  0 of 32 pieces"},
             Case{16, 32, "pieces", 1, "w  [============            ]  16 of 32 pieces"},
             Case{1024, 0, "B", 2, "w  1.0 kB  512 B/s"},
             Case{999'999'999, 1'000'000'000, "B", 10,
                  "w  [======================= ]  1.0 GB of 1.0 GB  100.0 MB/s"},
             Case{40, 32, "pieces", 1, "w  [========================]  40 of 32 pieces"},
         }) {
        EXPECT_EQ(Progress::LineFor("w", row.done, row.total, row.unit, row.seconds), row.line);
    }
}

TEST(ProgressTest, SilentUnlessOnATerminalAndGoneAtTheEnd) {
    std::ostringstream file, terminal;
    { Progress(file, false, "w", 2, "pieces").Update(2); }
    EXPECT_EQ(file.str(), "");
    { Progress(terminal, true, "w", 2, "pieces").Update(2); }
    EXPECT_TRUE(terminal.str().starts_with("\rw  ["));
    EXPECT_TRUE(terminal.str().ends_with(" \r")) << "the line stays";
}

class AtomicFileTest : public testing::Test {
  protected:
    TestFolder folder;
    const std::string path = folder.Path("file");
    const std::vector<std::uint8_t> before{1, 2, 3};
    const std::vector<std::uint8_t> after{9, 8};
};

TEST_F(AtomicFileTest, TakesItsNameWhenItIsComplete) {
    WriteFile(path, before);
    {
        AtomicFile file(path);
        file.Stream() << "half";
        file.Stream().flush();
        EXPECT_EQ(ReadFile(path), before);
        EXPECT_EQ(folder.Files().size(), 2u);
    }
    EXPECT_EQ(ReadFile(path), before);
    EXPECT_EQ(folder.Files(), std::vector<std::string>{"file"}) << "the incomplete file stays";
    WriteFileAtomically(path, after);
    EXPECT_EQ(ReadFile(path), after);
    EXPECT_EQ(folder.Files(), std::vector<std::string>{"file"});
}

TEST_F(AtomicFileTest, RefusesWhatExistsWhereThatIsWanted) {
    WriteFile(path, before);
    EXPECT_THROW(AtomicFile(path, AtomicFile::IfItExists::Refuse), ToolFailure);
    AtomicFile file(folder.Path("new"), AtomicFile::IfItExists::Refuse);
    WriteFile(folder.Path("new"), before);  // somebody was faster
    EXPECT_THROW(file.Commit(), ToolFailure);
    EXPECT_EQ(ReadFile(folder.Path("new")), before);
}

TEST_F(AtomicFileTest, NamesTheFileThatCannotBeWritten) {
    for (const std::string& name : {folder.Path(""), folder.Path("missing/file")}) {
        try {
            AtomicFile file(name);
            FAIL() << name;
        } catch (const ToolFailure& failure) {
            EXPECT_EQ(failure.Code(), ExitCode::File);
            EXPECT_NE(std::string(failure.what()).find(name), std::string::npos) << failure.what();
        }
    }
}

#if !defined(_WIN32)
TEST_F(AtomicFileTest, ALinkStaysAndADeviceIsWrittenTo) {
    WriteFile(path, before);
    std::filesystem::create_symlink(path, folder.Path("link"));
    WriteFileAtomically(folder.Path("link"), after);
    EXPECT_TRUE(std::filesystem::is_symlink(folder.Path("link")));
    EXPECT_EQ(ReadFile(path), after);
    WriteFileAtomically("/dev/null", after);
    EXPECT_TRUE(std::filesystem::is_character_file("/dev/null"));
    for (const std::size_t size : {std::size_t{2}, std::size_t{100'000}}) {  // either way through a buffer
        ExpectThrow<ToolFailure>("cannot write /dev/full: No space left on device", [size] {
            WriteFileAtomically("/dev/full", std::vector<std::uint8_t>(size));
        });
    }
}
#endif

}  // namespace
}  // namespace Varnholt::Tests
