// What a document owns, and the memory that it takes.
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "faults/faults.h"
#include "memory/memory.h"
#include "xml/pool.h"
#include "xml/storage.h"
#include "xml/writer.h"
#include "xml/xml_test.h"

namespace xml {
namespace {

class DocumentTest : public XmlTest {};

TEST_F(DocumentTest, IsEmptyAtFirst) {
  EXPECT_EQ(document().root(), nullptr);
  EXPECT_EQ(document().last_error(), XmlParseError::kNone);
  EXPECT_EQ(document().error_offset(), 0U);
  EXPECT_EQ(document().format_flags(), 0);
  EXPECT_EQ(document().MemoryInUse(), 0U);
  EXPECT_EQ(document().output().sink, nullptr);
  EXPECT_EQ(Allocations(), 0U) << "an empty document costs nothing";
}

TEST_F(DocumentTest, NamesTheSizeOfAnElementOnTheDevice) {
  EXPECT_EQ(document().element_size(), 24);
  static_assert(sizeof(XmlElement) == 24 || sizeof(void*) != 4);
}

TEST_F(DocumentTest, HasANewRootOfTheGivenName) {
  char name[] = "root";
  const char* const copy = document().NewDocument(name);
  ASSERT_NE(copy, nullptr);
  name[0] = 'b';

  EXPECT_STREQ(copy, "root") << "a copy";
  EXPECT_EQ(document().root()->name, copy);
  EXPECT_EQ(Shape(document()), "root");
}

TEST_F(DocumentTest, TakesNoRootWithoutAName) {
  ASSERT_NE(document().NewDocument("a"), nullptr);
  EXPECT_EQ(document().NewDocument(nullptr), nullptr);
  EXPECT_EQ(document().root(), nullptr);
}

TEST_F(DocumentTest, IsAsNewAfterBeingCleared) {
  ASSERT_EQ(Load("\xEF\xBB\xBF<a>\r\n\t<b/></a>"), XmlParseError::kNone);
  ASSERT_NE(Serialize(document()), nullptr);
  document().Clear();
  EXPECT_EQ(device().memory().live_blocks(), 0U);
  EXPECT_EQ(document().root(), nullptr);
  EXPECT_EQ(document().format_flags(), 0);
  EXPECT_EQ(document().output().length, 0U);
  EXPECT_EQ(document().output().position, nullptr);

  EXPECT_EQ(Load("<a>"), XmlParseError::kNoTag);
  document().Clear();
  EXPECT_EQ(document().last_error(), XmlParseError::kNone);
  EXPECT_EQ(document().error_offset(), 0U);
}

TEST_F(DocumentTest, FreesEverythingWhenItIsDestroyed) {
  {
    XmlDocument other;
    ASSERT_TRUE(other.LoadFromText("<a/>", 4));
    ASSERT_NE(Serialize(other), nullptr);
    EXPECT_EQ(device().memory().live_blocks(), 3U);
  }
  EXPECT_EQ(device().memory().live_blocks(), 0U);
}

TEST_F(DocumentTest, TakesTwoBlocksForAnyTextThatHasFewElements) {
  const std::string text = "<a>" + std::string(100000, 'x') + "</a>";
  ASSERT_EQ(Load(text), XmlParseError::kNone);
  EXPECT_EQ(Allocations(), 2U);
  EXPECT_GE(document().MemoryInUse(), 2 * text.size());
  EXPECT_LE(document().MemoryInUse(), 2 * text.size() + 1024) << "rounded up, and the headers";
}

TEST_F(DocumentTest, TakesFewBlocksForManyElements) {
  std::string text = "<a>";
  while (text.size() < 1000000) text += "<b/>";
  ASSERT_EQ(Load(text + "</a>"), XmlParseError::kNone);
  EXPECT_LE(Allocations(), 9U) << "blocks grow with what is there";
}

// An element takes at least four bytes of text, an attribute three, as its name may be empty: no
// text makes more records than a dozen bytes for each of its own, and a bit for the growth.
TEST_F(DocumentTest, TakesMemoryInProportionToAnyText) {
  for (const char* piece : {"<b/>", " x=''", "=''", "<b></b>", "&lt;"}) {
    const bool is_attribute = piece[0] == ' ' || piece[0] == '=';
    std::string text = is_attribute ? "<a" : "<a>";
    while (text.size() < 300000) text += piece;
    ASSERT_EQ(Load(text + (is_attribute ? "/>" : "</a>")), XmlParseError::kNone) << piece;
    EXPECT_LE(document().MemoryInUse(), 24 * text.size()) << piece;
  }
}

TEST_F(DocumentTest, SaysThatMemoryIsMissingWhicheverAllocationFails) {
  // Enough elements and attributes for several blocks of records.
  std::string text = "<a>";
  for (int i = 0; i < 200; ++i) text += "<b x='1'/>";
  text += "</a>";
  int nth = 1;
  for (;; ++nth) {
    device().faults().Add({"LocalAlloc", static_cast<std::uint64_t>(nth), 1, 0});
    const std::uint64_t fired = device().faults().fired();
    const XmlParseError error = Load(text);
    const bool failed = device().faults().fired() > fired;
    device().faults().Clear();
    EXPECT_EQ(error, failed ? XmlParseError::kOutOfMemory : XmlParseError::kNone) << nth;
    EXPECT_EQ(document().root() == nullptr, failed);
    if (!failed) break;
    document().Clear();
    EXPECT_EQ(device().memory().live_blocks(), 0U) << "after allocation " << nth << " failed";
  }
  EXPECT_GT(nth, 4) << "both first blocks, and some of the growth";
}

TEST_F(DocumentTest, IsEmptyWhenThereIsNoMemoryForItsRoot) {
  for (const std::uint64_t nth : {1U, 2U}) {
    device().faults().Add({"LocalAlloc", nth, 1, 0});
    EXPECT_EQ(document().NewDocument("a"), nullptr);
    EXPECT_EQ(document().root(), nullptr);
    EXPECT_EQ(device().memory().live_blocks(), 0U);
  }
  EXPECT_NE(document().NewDocument("a"), nullptr);
}

TEST_F(DocumentTest, RefusesATextThatNoMemoryCouldHold) {
  EXPECT_FALSE(document().LoadFromText("", std::size_t{1} << 31U));
  EXPECT_EQ(document().last_error(), XmlParseError::kOutOfMemory);
  EXPECT_FALSE(document().LoadFromText("", SIZE_MAX));
  EXPECT_EQ(document().last_error(), XmlParseError::kOutOfMemory);
  EXPECT_EQ(Allocations(), 0U);
}

class PoolTest : public XmlTest {
 protected:
  static constexpr std::size_t kHeader = 8 + sizeof(void*);

  /// Capacity of the block that the pool adds when `size` bytes more are asked for; 0 for none.
  std::size_t Grow(Pool& pool, std::size_t size) {
    const std::size_t before = pool.MemoryInUse();
    EXPECT_NE(pool.Take(size), nullptr);
    const std::size_t grown = pool.MemoryInUse() - before;
    return grown == 0 ? 0 : grown - kHeader;
  }
};

TEST_F(PoolTest, GrowsByHalfTheOnlyBlockAndThenByOneAndAHalfOfTheNewest) {
  Pool pool;
  std::vector<std::size_t> capacities;
  while (capacities.size() < 7) {
    if (const std::size_t capacity = Grow(pool, 8); capacity != 0) capacities.push_back(capacity);
  }
  // 128, 384, 768, 1152, 1920, 3072, each rounded up to a multiple of 256
  EXPECT_EQ(capacities, (std::vector<std::size_t>{256, 256, 512, 768, 1280, 2048, 3072}));
}

TEST_F(PoolTest, MakesABlockLargeEnoughForWhatIsAsked) {
  Pool pool;
  EXPECT_EQ(Grow(pool, 1000), 1024U);
  EXPECT_EQ(Grow(pool, 600), 768U) << "half of 1024 would not do";
  EXPECT_EQ(Grow(pool, 256), 1280U) << "one and a half of 768 is 1152";
}

TEST_F(PoolTest, TakesTheFirstBlockWithRoom) {
  Pool pool;
  EXPECT_EQ(Grow(pool, 200), 256U);
  EXPECT_EQ(Grow(pool, 200), 256U);
  EXPECT_EQ(Grow(pool, 50), 0U) << "in the newest";
  EXPECT_EQ(Grow(pool, 50), 0U) << "in the one before";
  EXPECT_EQ(Grow(pool, 7), 512U) << "six bytes are left in each";
}

TEST_F(PoolTest, FillsABlockToItsLastByte) {
  Pool pool;
  char* const first = static_cast<char*>(pool.Take(255));
  EXPECT_EQ(pool.Take(1), first + 255);
  std::memset(first, 'x', 256);
  EXPECT_EQ(pool.MemoryInUse(), 256 + kHeader);
  pool.Clear();
  EXPECT_EQ(pool.MemoryInUse(), 0U);
}

TEST_F(PoolTest, RoundsABlockThatWasAskedForUp) {
  Pool pool;
  ASSERT_TRUE(pool.AddBlock(0));
  EXPECT_EQ(pool.MemoryInUse(), 256 + kHeader);
  ASSERT_TRUE(pool.AddBlock(256));
  EXPECT_EQ(pool.MemoryInUse(), 512 + 2 * kHeader);
  ASSERT_TRUE(pool.AddBlock(257));
  EXPECT_EQ(pool.MemoryInUse(), 1024 + 3 * kHeader);
}

TEST_F(PoolTest, StaysAsItIsWhenThereIsNoMemory) {
  Pool pool;
  ASSERT_NE(pool.Take(200), nullptr);
  device().faults().Add({"LocalAlloc", 1, 1, 0});
  EXPECT_EQ(pool.Take(200), nullptr);
  EXPECT_NE(pool.Take(56), nullptr) << "what is left can still be had";
  EXPECT_EQ(pool.Take(Pool::kMaxCapacity), nullptr);
  EXPECT_EQ(pool.Take(SIZE_MAX), nullptr);
  EXPECT_FALSE(pool.AddBlock(SIZE_MAX));
  EXPECT_EQ(pool.MemoryInUse(), 256 + kHeader);
}

TEST_F(PoolTest, GivesReturnedRecordsOutFirstAndEmpty) {
  Storage storage;
  XmlElement* const element = storage.TakeElement();
  XmlAttribute* const attribute = storage.TakeAttribute();
  ASSERT_TRUE(element != nullptr && attribute != nullptr);
  element->name = element->text = attribute->name = attribute->value = "x";
  element->parent = element->first_child = element->next_sibling = element;
  storage.GiveBack(element);
  storage.GiveBack(attribute);
  storage.GiveBack(static_cast<XmlElement*>(nullptr));

  EXPECT_EQ(storage.TakeElement(), element);
  EXPECT_EQ(storage.TakeAttribute(), attribute);
  EXPECT_NE(storage.TakeElement(), element);
  EXPECT_EQ(element->name, nullptr);
  EXPECT_EQ(element->text, nullptr);
  EXPECT_EQ(element->parent, nullptr);
  EXPECT_EQ(element->first_child, nullptr);
  EXPECT_EQ(element->next_sibling, nullptr);
  EXPECT_EQ(attribute->name, nullptr);
  EXPECT_EQ(attribute->value, nullptr);
}

}  // namespace
}  // namespace xml
