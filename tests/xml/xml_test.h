// The fixture of tests of documents, and a short notation for trees.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <random>
#include <string>
#include <string_view>

#include "device/device.h"
#include "faults/faults.h"
#include "support/device_test.h"
#include "xml/document.h"

namespace xml {

/// An element and all below it: name, attributes in brackets, text in bars, children in braces.
/// <a x="1"><b>t</b><c/></a> is a[x=1]{b|t| c}.
std::string Shape(const XmlElement* element);

/// The shape of the root; "-" for an empty document.
std::string Shape(const XmlDocument& document);

/// Everything that a walk over the tree says by way of its steps, as text: "+b" for a start, "-b"
/// for an end.
std::string WalkOf(XmlDocument& document);

/// Hangs `depth` elements into one another, the innermost being `innermost`.
std::string Nested(int depth, std::string_view innermost);

class XmlTest : public DeviceTest {
 protected:
  /// At the end nothing may be left of any document.
  void TearDown() override;

  XmlParseError Load(std::string_view text) {
    const bool loaded = document_.LoadFromText(text.data(), text.size());
    EXPECT_EQ(loaded, document_.last_error() == XmlParseError::kNone);
    return document_.last_error();
  }
  /// The tree's shape, or "error 5".
  std::string ShapeOf(std::string_view text);

  [[nodiscard]] XmlDocument& document() { return document_; }
  /// A cursor at the root.
  [[nodiscard]] XmlCursor AtRoot();
  [[nodiscard]] std::uint64_t Allocations() { return device().faults().Count("LocalAlloc"); }

 private:
  XmlDocument document_;
};

/// One of some choices, the same in every run.
class Dice {
 public:
  explicit Dice(std::uint32_t seed) : random_(seed) {}
  /// 0 to `sides` - 1.
  std::size_t Roll(std::size_t sides) { return random_() % sides; }
  /// One of the words that are separated by blanks.
  std::string Word(std::string_view words);

 private:
  std::mt19937 random_;
};

}  // namespace xml
