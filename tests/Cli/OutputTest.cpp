#if !defined(_WIN32)
#include <sys/resource.h>
#endif

#include <cmath>
#include <csignal>
#include <cstdlib>
#include <limits>

#include "Output/Json.h"
#include "Output/LiveBlock.h"
#include "Output/ProgressLine.h"
#include "Output/RecordingFile.h"
#include "Output/Rows.h"
#include "Output/WallTimeText.h"
#include "Support/Bytes.h"
#include "Support/ExpectThrow.h"
#include "ToolFixture.h"
#include "Utilities/Files/AtomicFile.h"
#include "Utilities/Files/FileError.h"

namespace Varnholt::Tests {
namespace {

using namespace Cli;
using Service::Interruption;
using namespace Varnholt::Utilities::Files;

TEST(RowsTest, ColumnsAreAsWideAsTheirWidestCellAndLinesEndWithoutBlanks) {
    Rows rows({{"NAME"}, {"VALUE", "value", Rows::Right}, {"", "long", Rows::Hidden}, {"NOTE"}});
    rows.Add({"a", 1, "not in the table", ""});
    rows.Add({"longer", 12345678, "", "x"});
    rows.Add({"é"});
    EXPECT_EQ(rows.Text(),
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

TEST(PlotTest, RampsRiseFromLeftToRight) {
    EXPECT_EQ(Plot({0, 1, 2, 3}, false),
              "3 +   *\n"
              "  |  *\n"
              "1 + *\n"
              "0 +*\n"
              "  ++---\n"
              "   0\n");
    // Two by four dots in a character.
    EXPECT_EQ(Plot({0, 1, 2, 3, 4, 5, 6, 7}, true, 60, 2),
              "7 ┤  ⡠⠊\n"
              "0 ┤⡠⠊\n"
              "  └┬───\n"
              "   0\n");
}

TEST(PlotTest, HasTheLinesThatItSaysAndFitsIntoItsWidth) {
    constexpr double nan = std::numeric_limits<double>::quiet_NaN();
    constexpr double huge = std::numeric_limits<double>::max();
    std::vector<double> spike(1000);
    spike[997] = 9;  // is not lost by drawing several values in one column
    for (const std::vector<double>& values : std::vector<std::vector<double>>{
             {}, {5}, {5, 5, 5}, {nan, nan}, {1, nan, 3}, {-huge, huge}, {nan, INFINITY, -INFINITY}, spike}) {
        for (const int width : {-5, 0, 19, 20, 39, 64, 200}) {
            for (const bool braille : {false, true}) {
                const std::string text = Plot(values, braille, width, 5);
                EXPECT_EQ(std::count(text.begin(), text.end(), '\n'), PlotLines({braille, width, 5, ""}));
                EXPECT_TRUE(braille || values != spike || text.find('*') < text.find('\n')) << text;
                std::istringstream lines(text);
                for (std::string line; std::getline(lines, line);) {
                    std::erase_if(line, [](char c) { return (c & 0xC0) == 0x80; });  // one of each character
                    EXPECT_LE(line.size(), static_cast<std::size_t>(std::max(width, 19))) << text;
                }
            }
        }
    }
}

TEST(JsonTest, FloatsHaveTheDigitsThatTheyNeedAndTextsAreValid) {
    const std::vector<std::uint8_t> bytes{7, 8};
    EXPECT_EQ(Json({{"a", 0.068F}, {"b", -1.0F}, {"c", 1e-30F}, {"d", NAN}, {"e", bytes}, {"f", {}}}).Text(),
              "{\"a\":0.068,\"b\":-1.0,\"c\":1e-30,\"d\":null,\"e\":[7,8],\"f\":null}\n");
    EXPECT_TRUE(nlohmann::json::accept(Json({{"path", "x\xFFy"}}).Text()));
}

TEST(ProgressTest, Lines) {
    for (const auto& [done, total, unit, seconds, columns, line] :
         std::vector<std::tuple<std::uint64_t, std::uint64_t, const char*, double, std::size_t, const char*>>{
             {0, 32, "pieces", 0, 79, "w  [                        ]  0 of 32 pieces"},
             {16, 32, "pieces", 1, 79, "w  [============            ]  16 of 32 pieces"},
             {1024, 0, "B", 2, 79, "w  1.0 kB  512 B/s"},
             {40, 32, "pieces", 1, 79, "w  [========================]  40 of 32 pieces"},
             {16, 32, "pieces", 1, 30, "w  [====    ]  16 of 32 pieces"},
             {16, 32, "pieces", 1, 24, "w  16 of 32 pieces"},
             {999'999'999, 1'000'000'000, "B", 10, 19, "w  1.0 GB of 1.0 GB"},
         }) {
        EXPECT_EQ(ProgressLine::LineFor("w", done, total, unit, seconds, columns), line);
    }
}

TEST(LiveBlockTest, IsDrawnAnewWhereTheTerminalHasChanged) {
    StreamFacts facts;
    facts.isTerminal = facts.movesCursor = true;
    TerminalSize size;
    facts.size = [&size] { return size; };
    LiveBlock block(facts);
    EXPECT_EQ(block.Over("a\nb\n"), "a\nb\n");
    EXPECT_EQ(block.Over("c\n"), "\r\x1b[2A\x1b[Jc\n");
    size.columns = 20;
    EXPECT_EQ(block.Over("e\n"), "\x1b[H\x1b[2Je\n");
    EXPECT_EQ(block.Over("f\n"), "\r\x1b[1A\x1b[Jf\n");
    EXPECT_EQ(Wrapped("lowest 5 at 3, mean 12", 12), "lowest 5 at\n3, mean 12\n");
}

using Names = std::vector<std::string>;

class FileTest : public testing::Test {
  protected:
    std::string Content(const std::string& name) { return ReadText(folder_.Path(name)); }

    TestFolder folder_;
    const std::string path_ = folder_.Path("f");
    Interruption none_;
};

TEST_F(FileTest, AnAtomicFileTakesItsNameWhenItIsComplete) {
    WriteFile(path_, {1, 2, 3});
    {
        AtomicFile file(path_);
        file.Stream() << "half";
        file.Stream().flush();
        EXPECT_EQ(ReadFile(path_), (Bytes{1, 2, 3}));
        EXPECT_EQ(folder_.Files().size(), 2u);
    }
    EXPECT_EQ(folder_.Files(), Names{"f"}) << "the incomplete file stays";
    EXPECT_EQ(ReadFile(path_), (Bytes{1, 2, 3}));
    EXPECT_THROW(AtomicFile(path_, AtomicFile::IfItExists::Refuse), FileError);
    AtomicFile file(folder_.Path("new"), AtomicFile::IfItExists::Refuse);
    WriteFile(folder_.Path("new"), {7});  // somebody was faster
    EXPECT_THROW(file.Commit(), FileError);
    EXPECT_EQ(Content("new"), "\x07");
    AtomicFile hidden(folder_.Path("hidden"));
    std::filesystem::create_directory(folder_.Path("hidden"));
    EXPECT_THROW(hidden.Commit(), FileError);
    for (const std::string& name : {folder_.Path(""), folder_.Path("missing/file")}) {
        EXPECT_THAT([&] { AtomicFile impossible(name); },
                    testing::ThrowsMessage<FileError>(testing::HasSubstr(name)));
    }
}

TEST_F(FileTest, ARecordingIsKeptBesideAnEarlierOneOrReplacesIt) {
    WriteFile(path_, {'o', 'l', 'd'});
    std::filesystem::permissions(path_, std::filesystem::perms::owner_all);
    const auto permissions = std::filesystem::status(path_).permissions();
    {
        RecordingFile file(path_, none_);
        file.Append(std::string("1"), 1);
    }  // which nobody ended
    EXPECT_EQ(Content("f"), "old");
    EXPECT_EQ(Content("f.part"), "1");
    std::filesystem::remove(folder_.Path("f.part"));
    RecordingFile file(path_, none_);
    file.Append(std::string("head"), 0);
    file.Complete();
    EXPECT_EQ(Content("f"), "head");
    EXPECT_EQ(std::filesystem::status(path_).permissions(), permissions);
}

TEST_F(FileTest, ARecordingLeavesToOthersWhatIsTheirs) {
    {
        RecordingFile file(path_, none_);
        file.Append(std::string("1"), 1);
        WriteFile(path_, {'n', 'e', 'w'});
        EXPECT_EQ(file.KeepWholeRecords().file, folder_.Path("f.part"));
    }
    EXPECT_EQ(Content("f"), "new");
    ExpectThrow<FileError>(
        folder_.Path("f.part") + " exists: another run writes it, or one that was killed left it",
        [this] { RecordingFile(path_, none_); });
    EXPECT_EQ(Content("f.part"), "1");
}

#if !defined(_WIN32)
TEST_F(FileTest, AFullDiskLeavesTheWholeRecords) {
    using Form = RecordOutput::Form;
    for (const auto& [block, records, form, kept, content] :
         std::vector<std::tuple<std::string, std::uint64_t, Form, std::uint64_t, std::string>>{
             {"11\n2222\n3\n", 3, Form::Lines, 2, "head\n11\n2222\n"},
             {"11\n222222222222222\n", 2, Form::Lines, 1, "head\n11\n"},
             {"aaaabbbbccccdddd", 4, Form::EqualLength, 2, "head\naaaabbbb"},
             {"one that is not there as a whole", 1, Form::EqualLength, 0, ""},
         }) {
        SCOPED_TRACE(block);
        RecordingFile file(path_, none_);
        // Files of this process cannot grow beyond 14 bytes, as on a full disk.
        rlimit before{};
        ::getrlimit(RLIMIT_FSIZE, &before);
        const rlimit full{14, before.rlim_max};
        void (*const handler)(int) = ::signal(SIGXFSZ, SIG_IGN);
        ::setrlimit(RLIMIT_FSIZE, &full);
        file.Append(std::string("head\n"), 0);
        ExpectThrow<FileError>("cannot write " + path_ + ": File too large",
                               [&] { file.Append(block, records, form); });
        ::setrlimit(RLIMIT_FSIZE, &before);
        ::signal(SIGXFSZ, handler);
        EXPECT_EQ(file.Records(), kept);
        EXPECT_EQ(file.KeepWholeRecords().file, kept > 0 ? path_ : "");
        EXPECT_EQ(kept > 0 ? Content("f") : "", content);
        EXPECT_EQ(std::filesystem::remove(path_), kept > 0);
        EXPECT_EQ(folder_.Files(), Names());
    }
}

TEST_F(FileTest, ALinkStaysAndADeviceIsWrittenTo) {
    WriteFile(path_, {1});
    std::filesystem::create_symlink(path_, folder_.Path("link"));
    WriteFileAtomically(folder_.Path("link"), Bytes{9});
    EXPECT_TRUE(std::filesystem::is_symlink(folder_.Path("link")));
    EXPECT_EQ(ReadFile(path_), Bytes{9});
    for (const std::size_t size : {std::size_t{2}, std::size_t{100'000}}) {  // either way through a buffer
        ExpectThrow<FileError>("cannot write /dev/full: No space left on device",
                               [size] { WriteFileAtomically("/dev/full", Bytes(size)); });
    }
    EXPECT_TRUE(std::filesystem::is_character_file("/dev/full"));
    RecordingFile device("/dev/null", none_);
    device.Append(std::string("1"), 1);
    EXPECT_EQ(device.KeepWholeRecords().file, "/dev/null");
}

/// In zones that a POSIX text describes, so that no data base is needed.
TEST(WallTimeTextTest, LocalTimeAndItsZone) {
    for (const auto& [zone, seconds, text] : std::vector<std::tuple<const char*, std::int64_t, const char*>>{
             {"UTC0", 1'795'653'632, "2026-11-26T00:40:32.123+00:00"},
             {"CET-1CEST,M3.5.0,M10.5.0/3", 1'795'653'632, "2026-11-26T01:40:32.123+01:00"},
             {"CET-1CEST,M3.5.0,M10.5.0/3", 1'782'000'000, "2026-06-21T02:00:00.123+02:00"},
             {"NST3:30", 0, "1969-12-31T20:30:00.123-03:30"},
         }) {
        ::setenv("TZ", zone, 1);
        ::tzset();
        EXPECT_EQ(WallTimeText({seconds, 123}), text);
    }
}
#endif

}  // namespace
}  // namespace Varnholt::Tests
