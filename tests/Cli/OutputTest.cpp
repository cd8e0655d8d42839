#include <gtest/gtest.h>
#if !defined(_WIN32)
#include <fcntl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>
#endif

#include <cmath>
#include <csignal>
#include <cstdlib>
#include <limits>
#include <sstream>
#include <thread>

#include "Output/Json.h"
#include "Output/LiveBlock.h"
#include "Output/Plot.h"
#include "Output/ProgressLine.h"
#include "Output/RecordingFile.h"
#include "Output/Table.h"
#include "Output/WallTimeText.h"
#include "Service/Failure.h"
#include "Support/ExpectThrow.h"
#include "ToolFixture.h"
#include "Utilities/Files/AtomicFile.h"
#include "Utilities/Files/FileError.h"

namespace Varnholt::Tests {
namespace {

using namespace Cli;
using Service::Interruption;
using namespace Varnholt::Utilities::Files;

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
    const std::vector<std::uint8_t> bytes{7, 8};
    EXPECT_EQ(Json({{"a", 0.068F}, {"b", -1.0F}, {"c", 1e-30F}, {"d", NAN}, {"e", bytes}, {"f", {}}}).Text(),
              "{\"a\":0.068,\"b\":-1.0,\"c\":1e-30,\"d\":null,\"e\":[7,8],\"f\":null}\n");
    EXPECT_TRUE(nlohmann::json::accept(Json({{"path", "x\xFFy"}}).Text()));
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
        EXPECT_EQ(ProgressLine::LineFor("w", row.done, row.total, row.unit, row.seconds, row.columns),
                  row.line);
    }
}

TEST(ProgressTest, SilentUnlessOnATerminalAndGoneAtTheEnd) {
    StreamFacts facts;
    facts.isTerminal = true;
    std::ostringstream plain, terminal;
    { ProgressLine(plain, facts, "w", 2, "pieces").Update(2); }
    EXPECT_EQ(plain.str(), "") << "cannot be drawn on";
    facts.movesCursor = true;
    int columns = 200;
    facts.size = [&columns] { return TerminalSize{columns, 24}; };
    {
        ProgressLine progress(terminal, facts, "w", 2, "pieces");
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
    TestFolder folder_;
    const std::string path_ = folder_.Path("file");
    const std::vector<std::uint8_t> before_{1, 2, 3};
    const std::vector<std::uint8_t> after_{9, 8};
};

TEST_F(AtomicFileTest, TakesItsNameWhenItIsComplete) {
    WriteFile(path_, before_);
    {
        AtomicFile file(path_);
        file.Stream() << "half";
        file.Stream().flush();
        EXPECT_EQ(ReadFile(path_), before_);
        EXPECT_EQ(folder_.Files().size(), 2u);
    }
    EXPECT_EQ(ReadFile(path_), before_);
    EXPECT_EQ(folder_.Files(), std::vector<std::string>{"file"}) << "the incomplete file stays";
    WriteFileAtomically(path_, after_);
    EXPECT_EQ(ReadFile(path_), after_);
    EXPECT_EQ(folder_.Files(), std::vector<std::string>{"file"});
}

TEST_F(AtomicFileTest, RefusesWhatExistsWhereThatIsWanted) {
    WriteFile(path_, before_);
    EXPECT_THROW(AtomicFile(path_, AtomicFile::IfItExists::Refuse), FileError);
    AtomicFile file(folder_.Path("new"), AtomicFile::IfItExists::Refuse);
    WriteFile(folder_.Path("new"), before_);  // somebody was faster
    EXPECT_THROW(file.Commit(), FileError);
    EXPECT_EQ(ReadFile(folder_.Path("new")), before_);
}

TEST_F(AtomicFileTest, NamesTheFileThatCannotBeWritten) {
    for (const std::string& name : {folder_.Path(""), folder_.Path("missing/file")}) {
        try {
            AtomicFile file(name);
            FAIL() << name;
        } catch (const FileError& failure) {
            EXPECT_NE(std::string(failure.what()).find(name), std::string::npos) << failure.what();
        }
    }
}

class RecordingFileTest : public testing::Test {
  protected:
    using Form = RecordOutput::Form;
    using Action = RecordOutput::Remains (*)(RecordOutput& file);

    std::string Content(const std::string& name) {
        const auto bytes = ReadFile(folder_.Path(name));
        return {bytes.begin(), bytes.end()};
    }

    TestFolder folder_;
    Interruption none_;
};

TEST_F(RecordingFileTest, Ends) {
    const Action complete = [](RecordOutput& file) {
        file.Complete();
        return RecordOutput::Remains{};
    };
    const Action keep = [](RecordOutput& file) { return file.KeepWholeRecords(); };
    const Action discard = [](RecordOutput& file) {
        file.Discard();
        return RecordOutput::Remains{};
    };
    const Action nothing = [](RecordOutput&) { return RecordOutput::Remains{}; };
    struct Case {
        const char* name;
        bool existed;
        std::uint64_t records;
        Action end;
        std::vector<std::string> files;  ///< name and content
        RecordOutput::Remains remains;
    };
    for (const Case& row : {
             Case{"complete", false, 2, complete, {"f=head,1,2,"}, {}},
             Case{"complete, over another", true, 2, complete, {"f=head,1,2,"}, {}},
             Case{"complete without records", true, 0, complete, {"f=head,"}, {}},
             Case{"early", false, 2, keep, {"f=head,1,2,"}, {"f", ""}},
             Case{"early, another there", true, 2, keep, {"f=old", "f.part=head,1,2,"}, {"f.part", "f"}},
             Case{"early without records", true, 0, keep, {"f=old"}, {}},
             Case{"discarded", true, 2, discard, {"f=old"}, {}},
             Case{"discarded, nothing there", false, 2, discard, {}, {}},
             Case{"left alone", false, 1, nothing, {"f=head,1,"}, {}},
             Case{"left alone, another there", true, 1, nothing, {"f=old", "f.part=head,1,"}, {}},
         }) {
        SCOPED_TRACE(row.name);
        for (const std::string& name : folder_.Files()) {
            std::filesystem::remove(folder_.Path(name));
        }
        std::filesystem::perms permissions{};
        if (row.existed) {
            WriteFile(folder_.Path("f"), {'o', 'l', 'd'});
            std::filesystem::permissions(folder_.Path("f"), std::filesystem::perms::owner_all);
            permissions = std::filesystem::status(folder_.Path("f")).permissions();
        }
        {
            RecordingFile file(folder_.Path("f"), none_);
            EXPECT_THROW(RecordingFile(folder_.Path("f"), none_), FileError) << "two at once";
            file.Append(std::string("head,"), 0);
            for (std::uint64_t i = 1; i <= row.records; ++i) {
                file.Append(std::to_string(i) + ',', 1);
            }
            const auto remains = row.end(file);
            const auto path = [this](const std::string& name) {
                return name.empty() ? name : folder_.Path(name);
            };
            EXPECT_EQ(remains.file, path(row.remains.file));
            EXPECT_EQ(remains.earlier, path(row.remains.earlier));
        }
        std::vector<std::string> found;
        for (const std::string& name : folder_.Files()) {
            found.push_back(name + '=' + Content(name));
        }
        EXPECT_EQ(found, row.files);
        if (row.existed) {
            EXPECT_EQ(std::filesystem::status(folder_.Path("f")).permissions(), permissions);
        }
    }
}

TEST_F(RecordingFileTest, WhatAKilledRunLeftIsNotTouched) {
    WriteFile(folder_.Path("f.part"), {'k', 'e', 'p', 't'});
    ExpectThrow<FileError>(
        folder_.Path("f.part") + " exists: another run writes it, or one that was killed left it",
        [this] { RecordingFile(folder_.Path("f"), none_); });
    EXPECT_EQ(Content("f.part"), "kept");
}

TEST_F(RecordingFileTest, WhoTakesTheNameMeanwhileKeepsIt) {
    RecordingFile file(folder_.Path("f"), none_);
    file.Append(std::string("1"), 1);
    WriteFile(folder_.Path("f"), {'n', 'e', 'w'});
    EXPECT_EQ(file.KeepWholeRecords().file, folder_.Path("f.part"));
    EXPECT_EQ(Content("f"), "new");
    EXPECT_EQ(Content("f.part"), "1");
}

#if !defined(_WIN32)
/// Files of this process cannot grow beyond a size, as on a full disk.
class FullDisk final {
  public:
    explicit FullDisk(rlim_t size) {
        ::getrlimit(RLIMIT_FSIZE, &limitBefore_);
        handlerBefore_ = ::signal(SIGXFSZ, SIG_IGN);
        const rlimit limit{size, limitBefore_.rlim_max};
        ::setrlimit(RLIMIT_FSIZE, &limit);
    }
    ~FullDisk() {
        ::setrlimit(RLIMIT_FSIZE, &limitBefore_);
        ::signal(SIGXFSZ, handlerBefore_);
    }
    FullDisk(const FullDisk&) = delete;
    FullDisk& operator=(const FullDisk&) = delete;

  private:
    rlimit limitBefore_{};
    void (*handlerBefore_)(int) = nullptr;
};

TEST_F(RecordingFileTest, AFullDiskLeavesTheWholeRecords) {
    struct Case {
        std::string block;
        std::uint64_t records;
        Form form;
        std::uint64_t kept;
        std::string content;
    };
    for (const Case& row : {
             Case{"11\n2222\n3\n", 3, Form::Lines, 2, "head\n11\n2222\n"},
             Case{"11\n222222222222222\n", 2, Form::Lines, 1, "head\n11\n"},
             Case{"aaaabbbbccccdddd", 4, Form::EqualLength, 2, "head\naaaabbbb"},
             Case{"one that is not there as a whole", 1, Form::EqualLength, 0, ""},
         }) {
        SCOPED_TRACE(row.block);
        RecordingFile file(folder_.Path("f"), none_);
        {
            const FullDisk full(14);
            file.Append(std::string("head\n"), 0);
            ExpectThrow<FileError>("cannot write " + folder_.Path("f") + ": File too large",
                                   [&] { file.Append(row.block, row.records, row.form); });
        }
        EXPECT_EQ(file.Records(), row.kept);
        EXPECT_EQ(file.KeepWholeRecords().file, row.kept > 0 ? folder_.Path("f") : "");
        EXPECT_EQ(row.kept > 0 ? Content("f") : "", row.content);
        EXPECT_EQ(std::filesystem::remove(folder_.Path("f")), row.kept > 0);
        EXPECT_EQ(folder_.Files().size(), 0u);
    }
}

/// Whatever is waited for: a reader of a FIFO at all, and one that reads.
TEST_F(RecordingFileTest, AnInterruptionEndsEveryWait) {
    const std::string fifo = folder_.Path("fifo");
    ASSERT_EQ(::mkfifo(fifo.c_str(), 0600), 0);
    {
        Interruption interruption;
        std::thread user([&interruption] { interruption.Request(); });
        ExpectThrow<Failure>("interrupted", [&] { RecordingFile(fifo, interruption); });
        user.join();
    }
    const int idleReader = ::open(fifo.c_str(), O_RDONLY | O_NONBLOCK);
    ASSERT_GE(idleReader, 0);
    Interruption interruption;
    RecordingFile file(fifo, interruption);
    std::thread user([&interruption] { interruption.Request(); });
    const std::string records(1'000'000, 'x');
    ExpectThrow<Failure>("interrupted", [&] { file.Append(records, records.size() / 100); });
    user.join();
    EXPECT_EQ(file.Records(), static_cast<std::uint64_t>(::fcntl(idleReader, F_GETPIPE_SZ)) / 100);
    EXPECT_EQ(file.KeepWholeRecords().file, fifo);
    ::close(idleReader);
    EXPECT_TRUE(std::filesystem::is_fifo(fifo));
}

/// In zones that a POSIX text describes, so that no data base is needed.
TEST(WallTimeTextTest, LocalTimeAndItsZone) {
    const char* const before = std::getenv("TZ");
    const std::string zoneBefore = before != nullptr ? before : "";
    struct Case {
        const char* zone;
        std::int64_t seconds;
        const char* text;
    };
    for (const Case& row : {
             Case{"UTC0", 1'795'653'632, "2026-11-26T00:40:32.123+00:00"},
             Case{"CET-1CEST,M3.5.0,M10.5.0/3", 1'795'653'632, "2026-11-26T01:40:32.123+01:00"},
             Case{"CET-1CEST,M3.5.0,M10.5.0/3", 1'782'000'000, "2026-06-21T02:00:00.123+02:00"},
             Case{"NST3:30", 0, "1969-12-31T20:30:00.123-03:30"},
         }) {
        ::setenv("TZ", row.zone, 1);
        ::tzset();
        EXPECT_EQ(WallTimeText({row.seconds, 123}), row.text);
    }
    before != nullptr ? ::setenv("TZ", zoneBefore.c_str(), 1) : ::unsetenv("TZ");
    ::tzset();
}

TEST_F(AtomicFileTest, ALinkStaysAndADeviceIsWrittenTo) {
    WriteFile(path_, before_);
    std::filesystem::create_symlink(path_, folder_.Path("link"));
    WriteFileAtomically(folder_.Path("link"), after_);
    EXPECT_TRUE(std::filesystem::is_symlink(folder_.Path("link")));
    EXPECT_EQ(ReadFile(path_), after_);
    WriteFileAtomically("/dev/null", after_);
    EXPECT_TRUE(std::filesystem::is_character_file("/dev/null"));
    for (const std::size_t size : {std::size_t{2}, std::size_t{100'000}}) {  // either way through a buffer
        ExpectThrow<FileError>("cannot write /dev/full: No space left on device",
                               [size] { WriteFileAtomically("/dev/full", std::vector<std::uint8_t>(size)); });
    }
}
#endif

}  // namespace
}  // namespace Varnholt::Tests
