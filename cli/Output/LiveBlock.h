#pragma once

#include <string>

#include "Terminal.h"

namespace Varnholt::Cli {

/// Lines on a terminal that are drawn over the ones before. A terminal that cannot be drawn on gets them one
/// block below the other.
class LiveBlock final {
  public:
    explicit LiveBlock(StreamFacts facts) : terminal_(std::move(facts)) {}

    /// What is to be printed so that `lines`, none of them wider than the terminal and each with its line
    /// end, stand where the block before stood. After a change of the terminal's size, which may have broken
    /// the lines anew, the screen is cleared.
    std::string Over(const std::string& lines);

  private:
    const StreamFacts terminal_;
    TerminalSize sizeBefore_;
    std::ptrdiff_t linesBefore_ = 0;
};

/// `text` broken at blanks into lines of at most `width` characters, each with its line end.
std::string Wrapped(const std::string& text, std::size_t width);

}  // namespace Varnholt::Cli
