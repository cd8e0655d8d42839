#include "Utilities/Exceptions/Location.h"

#include <string_view>

namespace Varnholt::Utilities::Exceptions {
namespace {

/// Position just behind the bracket group that ends before `end`, searched backwards; npos when unbalanced.
std::size_t StartOfParameterList(std::string_view text) {
    int depth = 0;
    for (std::size_t i = text.size(); i-- > 0;) {
        if (text[i] == ')') {
            ++depth;
        } else if (text[i] == '(' && --depth == 0) {
            return i;
        }
    }
    return std::string_view::npos;
}

/// Position where the name begins: behind the last blank that is outside every bracket.
std::size_t StartOfName(std::string_view text) {
    int depth = 0;
    for (std::size_t i = text.size(); i-- > 0;) {
        const char c = text[i];
        if (c == '>' || c == ')' || c == '}') {
            ++depth;
        } else if (c == '<' || c == '(' || c == '{') {
            --depth;
        } else if (depth == 0 && (c == ' ' || c == '*' || c == '&')) {
            return i + 1;
        }
    }
    return 0;
}

}  // namespace

std::string FormatLocation(const char* context, const char* function, const char* file, int line) {
    constexpr std::string_view sourceRoot = "\\src\\";
    std::string_view fileName = file;
    if (const std::size_t root = fileName.rfind(sourceRoot); root != std::string_view::npos) {
        fileName.remove_prefix(root);
    }
    std::string text = context;
    text += "::";
    text += function;
    text += "(): ";
    text += fileName;
    text += ":";
    text += std::to_string(line);
    return text;
}

std::string QualifiedName(const char* signature) {
    std::string_view text = signature;
    std::string_view substitutions;
    if (const std::size_t with = text.find(" [with "); with != std::string_view::npos) {
        substitutions = text.substr(with);
        text = text.substr(0, with);
    }
    // An operator's own symbol would unbalance the bracket count below: set it aside.
    constexpr std::string_view Operator = "::operator";
    std::string symbol;
    if (const std::size_t op = text.rfind(Operator); op != std::string_view::npos) {
        const std::size_t symbolStart = op + Operator.size();
        const bool isCall = text.substr(symbolStart, 2) == "()";
        const std::size_t parameters = text.find('(', symbolStart + (isCall ? 2 : 0));
        if (parameters != std::string_view::npos) {
            symbol = text.substr(op, parameters - op);
            if (symbol == "::operator->" || symbol == "::operator*") {
                symbol.insert(Operator.size(), " ");  // as the locations of access operators have it
            }
            text = text.substr(0, op);
        }
    } else if (const std::size_t parameters = StartOfParameterList(text);
               parameters != std::string_view::npos) {
        text = text.substr(0, parameters);
    }
    std::string name(text.substr(StartOfName(text)));
    name += symbol;
    // A template's own parameter reads better as the type it stands for.
    constexpr std::string_view parameter = " [with T = ";
    if (substitutions.substr(0, parameter.size()) == parameter) {
        const std::string_view type =
            substitutions.substr(parameter.size(), substitutions.find_first_of(";]") - parameter.size());
        if (const std::size_t place = name.find("<T>"); place != std::string::npos) {
            name.replace(place + 1, 1, type);
        }
    }
    return name;
}

std::string Here(const SourceLocation& location) {
    return FormatLocation("", QualifiedName(location.function_name()).c_str(), location.file_name(),
                          static_cast<int>(location.line()));
}

}  // namespace Varnholt::Utilities::Exceptions
