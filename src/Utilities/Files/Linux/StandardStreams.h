#pragma once

namespace Varnholt::Utilities::Files {

/// Closed standard streams are made to lead nowhere: without that, the next file or connection that the
/// process opens would take their number, and whatever is printed would go into it. First thing in a program.
void SecureStandardStreams();

}  // namespace Varnholt::Utilities::Files
