#include "base/plist.h"

#include <cmath>
#include <gtest/gtest.h>
#include <limits>
#include <map>
#include <random>
#include <string>
#include <vector>

namespace tavrel::plist {
namespace {

constexpr double kTwoTo53 = 9007199254740992.0;
constexpr double kTwoTo63 = 9223372036854775808.0;

std::vector<std::string> keysOf(const Dictionary& dictionary) {
  std::vector<std::string> keys;
  for (const Entry& entry : dictionary)
    keys.emplace_back(entry.key.view());
  return keys;
}

TEST(Number, ComparesByValueWhateverTheKind) {
  using Case = std::tuple<Number, Number, bool>;
  for (const auto& [a, b, equal] :
       {Case(std::int8_t{-1}, std::int64_t{-1}, true), Case(1, 1.0F, true), Case(0, -0.0, true),
        Case(0, std::uint64_t{0}, true), Case(NAN, std::numeric_limits<float>::quiet_NaN(), true),
        Case((std::int64_t{1} << 53) + 1, kTwoTo53, false),
        Case(std::int64_t{1} << 53, kTwoTo53, true), Case(std::uint64_t{1} << 63, kTwoTo63, true),
        Case(UINT64_MAX, 2 * kTwoTo63, false), Case(INT64_MIN, -kTwoTo63, true),
        Case(INT64_MIN, std::uint64_t{1} << 63, false), Case(INT64_MAX, kTwoTo63, false),
        Case(UINT64_MAX, -1.0, false), Case(INT64_MAX, INFINITY, false)}) {
    EXPECT_EQ(a == b, equal) << a.real() << " " << b.real();
    EXPECT_EQ(b == a, equal) << a.real() << " " << b.real();
  }
}

TEST(Number, ConvertsWithoutUndefinedResults) {
  using Case = std::pair<Number, std::int64_t>;
  for (const auto& [number, integer] :
       {Case(1e300, INT64_MAX), Case(-INFINITY, INT64_MIN), Case(-kTwoTo63, INT64_MIN),
        Case(NAN, 0), Case(-2.9, -2), Case(UINT64_MAX, -1)})
    EXPECT_EQ(number.int64(), integer) << number.real();
  EXPECT_EQ(Number(UINT64_MAX).real(), 2 * kTwoTo63);
  EXPECT_EQ(Number(0x1'8000'0001LL).int32(), INT32_MIN + 1);
  EXPECT_EQ(Number(-1).uint32(), 0xFFFFFFFF);
}

TEST(Value, CopiesShareAndCopyingIsExplicit) {
  Dictionary inner{{"n", 1}};
  Dictionary outer{{"inner", inner}, {"bytes", Data(asBytes("ab"))}, {"list", Array{inner}}};
  const Dictionary shallow = mutableCopy(outer);
  const Dictionary deep = deepCopy(outer).dictionary();
  EXPECT_FALSE(shallow.isSame(outer));
  EXPECT_TRUE(shallow.dictionary("inner").isSame(inner));
  EXPECT_EQ(Value(deep), Value(outer));

  inner.set("n", 2);
  outer.data("bytes").bytes()[0] = std::byte{'x'};
  outer.set("new", 1);
  EXPECT_EQ(outer.array("list").at(0).dictionary().number("n"), Number(2));
  EXPECT_EQ(shallow.dictionary("inner").number("n"), Number(2));
  EXPECT_EQ(asText(shallow.data("bytes").bytes()), "xb");
  EXPECT_FALSE(shallow.contains("new"));
  EXPECT_EQ(deep.dictionary("inner").number("n"), Number(1));
  EXPECT_EQ(asText(deep.data("bytes").bytes()), "ab");
}

TEST(Value, EqualityLooksAtKindAndContent) {
  const Value none, date = Date::sinceEpoch(1), epoch = Date::sinceEpoch(0);
  const Value data = Data(asBytes("1")), noData = Data(ByteSpan());
  const Value array = Array{1}, noArray = Array::create();
  const Value dictionary = Dictionary{{"1", 1}}, noDictionary = Dictionary::create();
  const Value values[] = {none,  true, false,  1,     0,       "",         "1",         date,
                          epoch, data, noData, array, noArray, dictionary, noDictionary};
  for (std::size_t i = 0; i < std::size(values); ++i)
    for (std::size_t j = 0; j < std::size(values); ++j)
      EXPECT_EQ(values[i] == deepCopy(values[j]), i == j) << i << " " << j;
  EXPECT_EQ(Value(Dictionary{{"a", 1}, {"b", 2}}),
            Value(Dictionary{{"b", 2.0}, {"a", std::int64_t{1}}}));
  EXPECT_NE(Value(Dictionary{{"a", 1}, {"b", 2}}), Value(Dictionary{{"a", 1}, {"c", 2}}));
  EXPECT_EQ(Value(Date::sinceEpoch(std::nan(""))), Value(Date::sinceEpoch(std::nan(""))));
  EXPECT_NE(Value(std::string_view("a\0b", 3)), Value("a"));
}

TEST(Value, AbsentAndMistypedLookUpsYieldNothing) {
  const Dictionary empty;
  EXPECT_FALSE(empty.dictionary("a").array("b").at(3).dictionary().number("c"));
  EXPECT_TRUE(empty.begin() == empty.end());
  const Dictionary one{{"text", "t"}, {"yes", true}};
  EXPECT_FALSE(one.number("text") || one.boolean("text") || one.date("text") || one.data("text") ||
               one.array("text") || one.dictionary("text") || one.string("yes"));
  EXPECT_FALSE(one.number("yes") || Value(1).boolean());
  for (const Value& nothing : {Value(Dictionary()), Value(Array()), Value(Data())})
    EXPECT_TRUE(nothing.isNull());
}

TEST(Value, WritingThroughAnEmptyHandleGivesItAContainer) {
  Dictionary dictionary;
  const Dictionary stillEmpty = dictionary;
  dictionary.set("a", 1);
  const Dictionary shared = dictionary;
  dictionary.set("b", 2);
  EXPECT_EQ(shared.size(), 2U);
  EXPECT_FALSE(stillEmpty);
  Array array;
  array.append(1);
  array.append(2);
  array.set(2, "beyond");
  array.remove(2);
  array.remove(0);
  EXPECT_EQ(Value(array), Value(Array{2}));
}

TEST(Value, AssignmentOfItselfAndOfItsOwnPartIsSafe) {
  Value value = Dictionary{{"part", Array{"text"}}};
  Value& same = value;
  value = same;
  value = value.dictionary().get("part");
  EXPECT_EQ(value, Value(Array{"text"}));
  Dictionary names{{"key", "a name that stands only in this dictionary"}};
  names.set(*names.string("key"), 1);
  EXPECT_EQ(keysOf(names)[1], "a name that stands only in this dictionary");
  EXPECT_TRUE(names.remove(*names.string("key")));
  names.set(names.begin()->key, Value());
  EXPECT_TRUE(names.empty());
}

// Beyond sixteen entries there is an index, so compare random changes with a plain list of keys.
TEST(Dictionary, KeepsOrderAndContentThroughManyChanges) {
  std::mt19937 random(7);
  for (const unsigned keyCount : {4U, 16U, 17U, 500U}) {
    Dictionary dictionary;
    std::vector<std::string> order;
    std::map<std::string, int> content;
    for (int step = 0; step < 4000; ++step) {
      const std::string key = "key" + std::to_string(random() % keyCount);
      if (random() % 5 < 2) {
        EXPECT_EQ(dictionary.remove(key), content.erase(key) == 1);
        std::erase(order, key);
      } else {
        if (random() % 2 == 0)
          dictionary.set(key, step);
        else
          dictionary.set(String(key), step);
        if (content.insert_or_assign(key, step).second) order.push_back(key);
      }
      ASSERT_EQ(dictionary.size(), content.size());
      if (step % 50 == 0) {
        ASSERT_EQ(keysOf(dictionary), order);
        for (unsigned i = 0; i < keyCount; ++i) {
          const std::string name = "key" + std::to_string(i);
          ASSERT_EQ(dictionary.get(name), content.contains(name) ? Value(content[name]) : Value());
        }
      }
    }
  }
}

}  // namespace
}  // namespace tavrel::plist
