#include "platform/plist/coding.h"

#include <gtest/gtest.h>
#include <string>

#include "platform/plist/binary.h"

namespace tavrel::plist {
namespace {

TEST(Coding, RecognisesTheEncodingByContent) {
  PlistCoding coding;
  const Value value = Dictionary{{"a", Array{1, 2.5, "x"}}};
  const std::string xml = *coding.encodeXml(value);
  for (const std::string& bytes : {xml, "\xEF\xBB\xBF" + xml, *writeBinary(value)})
    EXPECT_EQ(*coding.decode(asBytes(bytes)), value);
  EXPECT_EQ(coding.decode({}).error().message, "not a property list: the document is empty");
  EXPECT_EQ(coding.decode(asBytes(" \n<html/>")).error().message,
            "XML property list, line 2, column 1: <html> is not an element of property lists");
}

}  // namespace
}  // namespace tavrel::plist
