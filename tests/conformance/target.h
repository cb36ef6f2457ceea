// What a test needs and only its target can give: environment.cpp and its like define these.
#pragma once

#include "coredll.h"

namespace conformance {

/// A library that is there, and two of its functions.
struct SampleLibrary {
  const WCHAR* name;
  const WCHAR* full_name;  ///< in other letter case, with its ending
  const WCHAR* function;
  const WCHAR* other_function;
  const WCHAR* wrong_case;  ///< the first function's name, which is none in this spelling
};
SampleLibrary KnownLibrary();

/// Puts a program there that does nothing and ends with 0.
void MakeProgram(const WCHAR* name);

}  // namespace conformance
