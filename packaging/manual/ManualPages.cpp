#include "ManualPages.h"

#include <algorithm>
#include <cctype>
#include <map>
#include <sstream>

#include "TextFile.h"

namespace Varnholt::Manual {
namespace {

std::string Upper(std::string text) {
    std::ranges::transform(text, text.begin(),
                           [](unsigned char c) { return static_cast<char>(std::toupper(c)); });
    return text;
}

/// A text in which every character means itself.
std::string Literal(const std::string& text) {
    static const std::map<char, std::string> escapes{{'\\', "\\e"},  {'-', "\\-"},   {'`', "\\(ga"},
                                                     {'^', "\\(ha"}, {'~', "\\(ti"}, {'\'', "\\(aq"}};
    std::string literal;
    for (const char c : text) {
        const auto escape = escapes.find(c);
        literal += escape == escapes.end() ? std::string(1, c) : escape->second;
    }
    return literal;
}

std::string Bold(const std::string& text) {
    return "\\fB" + Literal(text) + "\\fR";
}

std::string Italic(const std::string& text) {
    return "\\fI" + Literal(text) + "\\fR";
}

bool IsOptionName(const std::string& word) {
    return word.size() > 1 && word[0] == '-' && (word[1] == '-' || std::isalpha(word[1]) != 0);
}

/// Sentences: what stands between backticks, and names of options, are bold.
std::string Prose(const std::string& text) {
    std::string prose;
    std::istringstream pieces(text);
    std::string piece;
    for (bool isCode = false; std::getline(pieces, piece, '`'); isCode = !isCode) {
        if (isCode) {
            prose += Bold(piece);
            continue;
        }
        std::string word;
        const auto finish = [&] {
            const std::size_t end = word.find_last_not_of(".,;:)");
            if (IsOptionName(word) && end != std::string::npos) {
                prose += Bold(word.substr(0, end + 1)) + word.substr(end + 1);
            } else {
                prose += word.starts_with('-') ? Literal(word) : word;
            }
            word.clear();
        };
        for (const char c : piece) {
            if (c != ' ' && c != '(') {
                word += c == '\\' ? "\\e" : std::string(1, c);
                continue;
            }
            finish();
            prose += c;
        }
        finish();
    }
    return prose;
}

/// A description as the help has it, as a sentence.
std::string Sentence(std::string text) {
    if (text.size() > 1 && std::isupper(text[1]) == 0) {
        text.front() = static_cast<char>(std::toupper(text.front()));
    }
    return Prose(text.ends_with('.') ? text : text + ".");
}

/// A line of text that the formatter does not take for a request.
std::string Line(const std::string& text) {
    return (text.starts_with('.') || text.starts_with('\'') ? "\\&" : "") + text + "\n";
}

std::string Listed(const std::vector<std::string>& names, const std::string& conjunction) {
    std::string text;
    for (std::size_t i = 0; i < names.size(); ++i) {
        text += i == 0 ? "" : i + 1 == names.size() ? " " + conjunction + " " : ", ";
        text += Bold(names[i]);
    }
    return text;
}

std::string PathText(const CommandDescription& command) {
    std::string text;
    for (const std::string& name : command.path) {
        text += (text.empty() ? "" : " ") + name;
    }
    return text;
}

/// The value as it stands behind an option's name.
std::string ValueText(const OptionDescription& option) {
    if (option.takes == Takes::Nothing) {
        return {};
    }
    if (option.takes == Takes::OneOf) {
        std::string text;
        for (const std::string& value : option.values) {
            text += (text.empty() ? "" : "|") + Bold(value);
        }
        return " " + text;
    }
    return " " + Italic(option.placeholder);
}

std::string ArgumentText(const OptionDescription& argument) {
    const std::string text = Italic(argument.names.front()) + (argument.isRepeated ? "..." : "");
    return argument.isRequired ? text : "[" + text + "]";
}

std::string OptionText(const OptionDescription& option) {
    std::string text = ".TP\n";
    for (const std::string& name : option.names) {
        text += (&name == &option.names.front() ? "" : ", ") + Bold(name);
    }
    const bool beginsWithValue = std::ranges::any_of(
        option.values, [&option](const std::string& value) { return option.about.starts_with(value + ":"); });
    text +=
        ValueText(option) + "\n" + Line(beginsWithValue ? Prose(option.about + ".") : Sentence(option.about));
    if (!option.byDefault.empty() && option.takes != Takes::Nothing) {
        text += "The default is " + Literal(option.byDefault) + ".\n";
    }
    if (!option.needs.empty()) {
        text += "Needs " + Listed(option.needs, "and") + ".\n";
    }
    if (!option.excludes.empty()) {
        text += "Cannot be combined with " + Listed(option.excludes, "or") + ".\n";
    }
    return text;
}

/// Arguments, then options under the headings that they have in the help.
std::string OptionsText(const CommandDescription& command) {
    std::string text;
    for (const OptionDescription& argument : command.arguments) {
        text += ".TP\n" + Italic(argument.names.front()) + "\n" + Line(Sentence(argument.about));
    }
    std::vector<std::string> headings;
    for (const OptionDescription& option : command.options) {
        if (std::ranges::find(headings, option.heading) == headings.end()) {
            headings.push_back(option.heading);
        }
    }
    for (const std::string& heading : headings) {
        if (heading != "Options") {
            text += ".P\n" + Bold(heading + ":") + "\n";
        }
        for (const OptionDescription& option : command.options) {
            if (option.heading == heading) {
                text += OptionText(option);
            }
        }
    }
    return text;
}

std::string SynopsisLine(const CommandDescription& command) {
    std::string text = Bold(PathText(command)) + " [" + Italic("OPTION") + "]...";
    if (!command.commands.empty()) {
        text += " " + Italic("COMMAND") + " [" + Italic("ARGUMENT") + "]...";
    }
    for (const OptionDescription& argument : command.arguments) {
        text += " " + ArgumentText(argument);
    }
    return text + "\n";
}

std::size_t Indentation(const std::string& line) {
    return line.find_first_not_of(' ');
}

/// A block of the footer without its blank lines: sentences, entries of a word or number and what it means,
/// commands with what they do below, or a list as it stands.
std::string BlockText(const std::vector<std::string>& lines) {
    std::string text;
    bool inParagraph = false;
    for (std::size_t i = 0; i < lines.size(); ++i) {
        const std::size_t indentation = Indentation(lines[i]);
        const std::string content = lines[i].substr(indentation);
        if (indentation == 0) {
            text += (inParagraph ? "" : ".P\n") + Line(Prose(content));
            inParagraph = true;
            continue;
        }
        inParagraph = false;
        if (const std::size_t gap = content.find("  ");
            std::isdigit(content.front()) != 0 && gap != std::string::npos) {
            text += ".TP\n" + Bold(content.substr(0, gap)) + "\n" + Line(Sentence(content.substr(gap + 2)));
            continue;
        }
        if (i + 1 == lines.size() || Indentation(lines[i + 1]) <= indentation) {
            text += ".RS 4\n" + Line(Prose(content)) + ".RE\n";
            continue;
        }
        text += ".TP\n" + Bold(content) + "\n";
        for (bool isFirst = true; i + 1 < lines.size() && Indentation(lines[i + 1]) > indentation; ++i) {
            text += (isFirst ? "" : ".br\n") + Line(Prose(lines[i + 1].substr(Indentation(lines[i + 1]))));
            isFirst = false;
        }
    }
    return text;
}

/// The footer by section; what has no heading of its own belongs to the description.
std::map<std::string, std::string> FooterSections(const std::string& footer) {
    static const std::map<std::string, std::string> headings{{"Examples:", "EXAMPLES"},
                                                             {"Exit codes:", "EXIT STATUS"}};
    std::map<std::string, std::string> sections;
    std::vector<std::string> block;
    const auto finish = [&] {
        std::string section = "DESCRIPTION";
        for (const auto& [heading, title] : headings) {
            if (!block.empty() && block.front().starts_with(heading)) {
                section = title;
                block.front().erase(0, std::min(heading.size() + 1, block.front().size()));
                if (block.front().empty()) {
                    block.erase(block.begin());
                }
            }
        }
        sections[section] += BlockText(block);
        block.clear();
    };
    std::istringstream lines(footer);
    for (std::string line; std::getline(lines, line);) {
        if (line.empty()) {
            finish();
        } else {
            block.push_back(line);
        }
    }
    finish();
    return sections;
}

std::string PageName(const CommandDescription& command) {
    return command.path.size() == 1 ? command.name : command.path.front() + "-" + command.name;
}

/// The program's name is left out of what it says of itself.
std::string About(const CommandDescription& command) {
    const std::string prefix = command.name + ": ";
    return command.about.starts_with(prefix) ? command.about.substr(prefix.size()) : command.about;
}

std::string Head(const CommandDescription& command) {
    std::string about = About(command);
    if (about.ends_with('.')) {
        about.pop_back();
        about.front() = static_cast<char>(std::tolower(about.front()));
    }
    return ".TH " + Literal(Upper(PageName(command))) +
           " 1 \"\" \"ostra " OSTRA_VERSION "\" \"User Commands\"\n" + ".SH NAME\n" +
           Literal(PageName(command)) + " \\- " + Prose(about) + "\n.SH SYNOPSIS\n";
}

std::string SeeAlso(const std::vector<std::string>& pages) {
    std::string text = ".SH SEE ALSO\n";
    for (const std::string& page : pages) {
        const std::size_t section = page.find('(');
        text += ".BR \\%" + Literal(page.substr(0, section)) + " " + page.substr(section) +
                (&page == &pages.back() ? "" : ",") + "\n";
    }
    return text;
}

std::string ProgramPage(const CommandDescription& program, const std::vector<std::string>& others) {
    auto sections = FooterSections(program.footer);
    std::string text = Head(program) + SynopsisLine(program) + ".SH DESCRIPTION\n" +
                       Line(Sentence(About(program))) + sections["DESCRIPTION"];
    std::vector<std::string> pages;
    if (!program.commands.empty()) {
        text += ".SH COMMANDS\n";
        for (const CommandDescription& command : program.commands) {
            text += ".TP\n.BR \\%" + Literal(PageName(command)) + " (1)\n" + Line(Sentence(command.about));
            pages.push_back(PageName(command) + "(1)");
        }
    }
    text += ".SH OPTIONS\n" + OptionsText(program);
    for (const std::string title : {"EXIT STATUS", "EXAMPLES"}) {
        if (!sections[title].empty()) {
            text += ".SH " + title + "\n" + sections[title];
        }
    }
    pages.insert(pages.end(), others.begin(), others.end());
    return text + SeeAlso(pages);
}

std::string CommandPage(const CommandDescription& program, const CommandDescription& command) {
    std::string text = Head(command);
    if (command.commands.empty()) {
        text += SynopsisLine(command);
    }
    for (const CommandDescription& member : command.commands) {
        text += (&member == &command.commands.front() ? "" : ".br\n") + SynopsisLine(member);
    }
    text +=
        ".SH DESCRIPTION\n" + Line(Sentence(command.about)) + FooterSections(command.footer)["DESCRIPTION"];
    if (command.commands.empty()) {
        text += ".SH OPTIONS\n" + OptionsText(command);
    } else {
        text += ".SH COMMANDS\n";
        for (const CommandDescription& member : command.commands) {
            text += ".SS " + Literal(PathText(member)) + "\n" + Line(Sentence(member.about)) +
                    FooterSections(member.footer)["DESCRIPTION"] + OptionsText(member);
        }
    }
    text += ".P\nThe options of\n.BR \\%" + Literal(program.name) +
            " (1)\nitself may stand before the command or behind it.\n.SH EXIT STATUS\nAs that of\n.BR \\%" +
            Literal(program.name) + " (1).\n";
    return text + SeeAlso({program.name + "(1)"});
}

}  // namespace

void WriteManualPages(const CommandDescription& program, const std::vector<std::string>& others,
                      const std::filesystem::path& folder) {
    WriteTextFile(folder / (PageName(program) + ".1"), ProgramPage(program, others));
    for (const CommandDescription& command : program.commands) {
        WriteTextFile(folder / (PageName(command) + ".1"), CommandPage(program, command));
    }
}

}  // namespace Varnholt::Manual
