#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <sstream>

#include "Failure.h"
#include "Output/AtomicFile.h"
#include "Output/Json.h"
#include "Output/LiveBlock.h"
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

/// Characters, of a text that holds none that are wider.
std::size_t Columns(const std::string& line) {
    return static_cast<std::size_t>(
        std::count_if(line.begin(), line.end(), [](char c) { return (c & 0xC0) != 0x80; }));
}

std::vector<std::string> LinesOf(const std::string& text) {
    std::istringstream stream(text);
    std::vector<std::string> lines;
    for (std::string line; std::getline(stream, line);) {
        lines.push_back(line);
    }
    return lines;
}

TEST(PlotTest, HasTheLinesThatItSaysAndFitsIntoItsWidth) {
    const double nan = std::numeric_limits<double>::quiet_NaN();
    const double huge = std::numeric_limits<double>::max();
    std::vector<double> spike(1000);
    spike[997] = 9;  // is not lost by drawing several values in one column
    for (const std::vector<double>& values : std::vector<std::vector<double>>{
             {}, {5}, {5, 5, 5}, {nan, nan}, {1, nan, 3}, {-huge, huge}, {nan, INFINITY, -INFINITY}, spike}) {
        for (const int width : {-5, 0, 19, 20, 39, 64, 200}) {
            for (const bool braille : {false, true}) {
                const std::string text = Plot(values, braille, width, 5);
                EXPECT_EQ(std::count(text.begin(), text.end(), '\n'), PlotLines({braille, width, 5, ""}));
                const auto lines = LinesOf(text);
                EXPECT_TRUE(braille || values != spike || lines[0].find('*') != std::string::npos) << text;
                for (const std::string& line : lines) {
                    EXPECT_LE(Columns(line), static_cast<std::size_t>(std::max(width, 19))) << text;
                }
            }
        }
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
        std::size_t columns;
        const char* line;
    };
    for (const Case& row : {
             Case{0, 32, "pieces", 0, 79, "w  [                        ]  0 of 32 pieces"},
             Case{16, 32, "pieces", 1, 79, "w  [============            ]  16 of 32 pieces"},
             Case{1024, 0, "B", 2, 79, "w  1.0 kB  512 B/s"},
             Case{999'999'999, 1'000'000'000, "B", 10, 79,
                  "w  [======================= ]  1.0 GB of 1.0 GB  100.0 MB/s"},
             Case{40, 32, "pieces", 1, 79, "w  [========================]  40 of 32 pieces"},
             Case{16, 32, "pieces", 1, 30, "w  [====    ]  16 of 32 pieces"},
             Case{16, 32, "pieces", 1, 24, "w  16 of 32 pieces"},
             Case{999'999'999, 1'000'000'000, "B", 10, 19, "w  1.0 GB of 1.0 GB"},
         }) {
        EXPECT_EQ(Progress::LineFor("w", row.done, row.total, row.unit, row.seconds, row.columns), row.line);
    }
}

TEST(ProgressTest, SilentUnlessOnATerminalAndGoneAtTheEnd) {
    StreamFacts facts;
    facts.isTerminal = true;
    std::ostringstream plain, terminal;
    { Progress(plain, facts, "w", 2, "pieces").Update(2); }
    EXPECT_EQ(plain.str(), "") << "cannot be drawn on";
    facts.movesCursor = true;
    int columns = 200;
    facts.size = [&columns] { return TerminalSize{columns, 24}; };
    {
        Progress progress(terminal, facts, "w", 2, "pieces");
        progress.Update(2);
        columns = 10;
        terminal.str({});
        progress.Update(2);
        EXPECT_EQ(terminal.str(), "\rw  2 of 2");
        terminal.str({});
    }
    EXPECT_EQ(terminal.str(), "\r" + std::string(9, ' ') + "\r") << "the line stays";
}

TEST(LiveBlockTest, IsDrawnOverUnlessTheTerminalHasChangedOrCannot) {
    StreamFacts facts;
    facts.isTerminal = true;
    EXPECT_EQ(LiveBlock(facts).Over("a\n"), "a\n");
    facts.movesCursor = true;
    TerminalSize size;
    facts.size = [&size] { return size; };
    LiveBlock block(facts);
    EXPECT_EQ(block.Over("a\nb\n"), "a\nb\n");
    EXPECT_EQ(block.Over("c\n"), "\r\x1b[2A\x1b[Jc\n");
    EXPECT_EQ(block.Over("d\n"), "\r\x1b[1A\x1b[Jd\n");
    size.columns = 20;
    EXPECT_EQ(block.Over("e\n"), "\x1b[H\x1b[2Je\n");
    EXPECT_EQ(block.Over("f\n"), "\r\x1b[1A\x1b[Jf\n");
    EXPECT_EQ(Wrapped("lowest 5 at 3, mean 12", 12), "lowest 5 at\n3, mean 12\n");
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
