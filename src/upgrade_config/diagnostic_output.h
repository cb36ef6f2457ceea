// Where diagnostic texts of the library go: nowhere, unless a test or a developer's build listens.
#pragma once

namespace orvenix {

/// Takes one text, which is valid during the call.
using DiagnosticOutput = void (*)(const char* text) noexcept;

/// Sets the one output of the process. Null, as at its start and always in a release: texts are not
/// even made. Any thread.
void SetDiagnosticOutput(DiagnosticOutput output) noexcept;

}  // namespace orvenix
