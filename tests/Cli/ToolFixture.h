#pragma once

#include <gmock/gmock.h>

#include <functional>
#include <nlohmann/json.hpp>
#include <sstream>

#include "Support/SimulatedHost.h"
#include "Support/TestClock.h"
#include "Support/TestFolder.h"
#include "Tool.h"

namespace Varnholt::Tests {

/// Runs the tool in this process. The streams say that they are no terminals, unless a test says otherwise.
class ToolRunner {
  public:
    /// The words of a command line; "@NAME" is a file in the folder, "''" an empty word.
    Cli::ExitCode Run(const std::string& line) {
        std::vector<std::string> arguments;
        std::istringstream words(line);
        for (std::string word; words >> word;) {
            arguments.push_back(word == "''"            ? ""
                                : word.starts_with('@') ? folder.Path(word.substr(1))
                                                        : word);
        }
        out_.str({});
        err_.str({});
        log_.str({});
        Cli::Streams streams{out_, err_, log_, outFacts, errFacts, inputPatience};
        interruption.Withdraw();
        return Cli::RunTool(arguments, streams, interruption);
    }
    /// From now on nothing can be written to standard output.
    void CloseOut() { out_.setstate(std::ios::badbit); }
    std::string Out() const { return out_.str(); }
    std::string Err() const { return err_.str(); }
    /// The lines of --verbose.
    std::string Log() const { return log_.str(); }
    nlohmann::json Json() const { return nlohmann::json::parse(out_.str()); }
    std::vector<std::string> Lines() const {
        std::vector<std::string> lines;
        std::istringstream stream(out_.str());
        for (std::string line; std::getline(stream, line);) {
            lines.push_back(line);
        }
        return lines;
    }

    const TestFolder folder{};
    Cli::StreamFacts outFacts, errFacts;
    std::uint32_t inputPatience = 30'000;
    Service::Interruption interruption;  ///< of the command that runs

  private:
    std::ostringstream out_, err_, log_;
};

/// The tool on a host with simulated instruments, on both transports, in virtual time.
class ToolTest : public testing::TestWithParam<Transport> {
  protected:
    /// Succeeds and prints `text`, or the test fails with what the tool said.
    void Succeed(const std::string& line, const std::string& text = "") {
        EXPECT_EQ(tool_.Run(line), Cli::ExitCode::Success) << line << ": " << tool_.Err();
        EXPECT_THAT(tool_.Out(), testing::HasSubstr(text)) << line;
    }
    /// What it prints with success.
    nlohmann::json JsonOf(const std::string& line) {
        Succeed(line);
        return tool_.Json();
    }
    /// Fails with this code, and tells the user of it with `text`.
    void Fail(const std::string& line, Cli::ExitCode code, const std::string& text = "") {
        EXPECT_EQ(tool_.Run(line), code) << line << ": " << tool_.Err();
        EXPECT_THAT(tool_.Err(), testing::HasSubstr(text)) << line;
    }
    std::string Identifier(const std::string& name = "sim") const { return host_.Identifier(name); }
    void SetFaults(const std::string& plan) {
        host_.Bus().SetFaults("sim", Simulator::FaultPlan::Parse(plan));
    }
    /// Has something happen, so many microseconds from now.
    void After(std::uint64_t microseconds, std::function<void()> event) {
        auto& scheduler = Platform::ClockScheduler();
        scheduler.CallAt(scheduler.Now() + microseconds, std::move(event), this);
    }
    void ForgetEvents() { Platform::ClockScheduler().Forget(this); }
    static Simulator::MeasureParameters ParametersOf(Simulator::SimulatedInstrument& instrument) {
        return instrument.WithCommands([](const auto& commands) { return commands.parameters; });
    }
    static int ModeOf(Simulator::SimulatedInstrument& instrument) {
        return instrument.WithCommands([](const auto& commands) { return commands.mode; });
    }

    TestClock clock_{TestTime::Virtual};
    SimulatedHost host_{GetParam()};
    ToolRunner tool_;
    const TestFolder& folder_ = tool_.folder;
};

}  // namespace Varnholt::Tests
