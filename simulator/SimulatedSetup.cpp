#include "SimulatedSetup.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <stdexcept>

namespace Varnholt::Simulator {
namespace {

struct Word {
    std::string key;
    std::string value;
};

[[noreturn]] void Refuse(const Word& word, const std::string& wanted) {
    throw std::runtime_error(word.key + "=" + word.value + ": " + wanted);
}

/// Takes the next word off the text; an empty key at its end.
Word TakeWord(std::string_view& text) {
    constexpr std::string_view spaces = " \t\r\n";
    while (!text.empty() && (text.front() == '#' || spaces.find(text.front()) != std::string_view::npos)) {
        text.remove_prefix(text.front() == '#' ? std::min(text.find('\n'), text.size()) : 1);
    }
    Word word;
    bool isKey = true;
    bool isQuoted = false;
    for (; !text.empty(); text.remove_prefix(1)) {
        const char next = text.front();
        if (next == '"') {
            isQuoted = !isQuoted;
        } else if (!isQuoted && spaces.find(next) != std::string_view::npos) {
            break;
        } else if (isKey && next == '=') {
            isKey = false;
        } else {
            (isKey ? word.key : word.value) += next;
        }
    }
    if (isQuoted) {
        Refuse(word, "the quotes do not end");
    }
    if (isKey && !word.key.empty()) {
        throw std::runtime_error(word.key + ": KEY=VALUE is wanted");
    }
    return word;
}

double NumberIn(const Word& word, double highest) {
    char* end = nullptr;
    const double number = std::strtod(word.value.c_str(), &end);
    if (word.value.empty() || *end != '\0' || !(number >= 0) || number > highest) {
        Refuse(word, "a number from 0 is wanted");
    }
    return number;
}

/// Whether it is the second of two choices.
bool IsSecond(const Word& word, const std::string& first, const std::string& second) {
    if (word.value != first && word.value != second) {
        Refuse(word, first + " or " + second + " is wanted");
    }
    return word.value == second;
}

void Set(SimulatedSetup::Instrument& instrument, const Word& word) {
    constexpr double highestFactor = 1e6;
    constexpr double highestSeed = 1e15;
    if (word.key == "seed") {
        instrument.settings.seed = static_cast<std::uint64_t>(NumberIn(word, highestSeed));
    } else if (word.key == "light") {
        instrument.settings.light = NumberIn(word, highestFactor);
    } else if (word.key == "gain") {
        instrument.settings.gain = NumberIn(word, highestFactor);
    } else if (word.key == "firmware") {
        instrument.settings.firmware = IsSecond(word, "old", "new") ? NewFirmware : OldFirmware;
    } else if (word.key == "integrate") {
        instrument.settings.takesIntegrationTime = IsSecond(word, "no", "yes");
    } else if (word.key == "eeprom") {
        instrument.eepromFile = word.value;
    } else if (word.key == "faults") {
        instrument.faults = FaultPlan::Parse(word.value);
    } else {
        Refuse(word, "the keys are name, seed, light, gain, firmware, integrate, eeprom, faults and time");
    }
}

}  // namespace

SimulatedSetup SimulatedSetup::Parse(std::string_view text) {
    SimulatedSetup setup;
    bool isNamed = false;
    const auto add = [&setup](const std::string& name) {
        setup.instruments.push_back({name, SettingsOfNumber(setup.instruments.size()), {}, {}});
    };
    for (Word word = TakeWord(text); !word.key.empty(); word = TakeWord(text)) {
        if (word.key == "time") {
            setup.isTimeVirtual = IsSecond(word, "real", "virtual");
        } else if (word.key == "name") {
            const auto hasName = [&word](const Instrument& other) { return other.name == word.value; };
            if (word.value.empty() || word.value.find_first_of("/\\") != std::string::npos ||
                (isNamed && std::ranges::any_of(setup.instruments, hasName))) {
                Refuse(word, "a name of its own is wanted, without slash and backslash");
            }
            if (!isNamed && !setup.instruments.empty()) {
                Refuse(word, "it stands before the words of its instrument");
            }
            isNamed = true;
            add(word.value);
        } else {
            if (setup.instruments.empty()) {
                add("1");
            }
            Set(setup.instruments.back(), word);
        }
    }
    if (setup.instruments.empty()) {
        add("1");
    }
    return setup;
}

}  // namespace Varnholt::Simulator
