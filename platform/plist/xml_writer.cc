#include <algorithm>
#include <cstddef>
#include <limits>
#include <string>
#include <string_view>

#include "base/base64.h"
#include "base/iso_date.h"
#include "platform/plist/encodable_text.h"
#include "platform/plist/encoding_walk.h"
#include "platform/plist/scalar_text.h"
#include "platform/plist/xml.h"

namespace tavrel::plist {
namespace {

constexpr std::size_t kDataBytesPerLine = 57;  // 76 characters

class XmlWriter {
 public:
  Expected<std::string> write(const Value& root) {
    out_ = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n";
    if (!writeValue(root, 0)) return guard_.error();
    out_ += "</plist>\n";
    if (!guard_.admitBytes(out_.size())) return guard_.error();
    return std::move(out_);
  }

 private:
  // `depth` is the number of containers around the value, and of the tabs before it.
  bool writeValue(const Value& value, std::size_t depth) {
    if (!guard_.admit(value, depth) || !guard_.admitBytes(out_.size())) return false;
    out_.append(depth, '\t');
    switch (value.kind()) {
      case Kind::Null:
        break;  // not admitted
      case Kind::Boolean:
        out_ += *value.boolean() ? "<true/>\n" : "<false/>\n";
        break;
      case Kind::Number: {
        const Number number = *value.number();
        const std::string_view name = number.isFloating() ? "real" : "integer";
        open(name);
        appendNumber(out_, number);
        close(name);
        break;
      }
      case Kind::Date:
        open("date");
        if (!appendIsoInstant(out_, *value.date()))
          return guard_.fail("the date is beyond any calendar");
        close("date");
        break;
      case Kind::String:
        open("string");
        appendXmlText(out_, *value.string());
        close("string");
        break;
      case Kind::Data:
        writeData(value.data().bytes(), depth);
        break;
      case Kind::Array:
        return writeArray(value.array(), depth);
      case Kind::Dictionary:
        return writeDictionary(value.dictionary(), depth);
    }
    return true;
  }

  void writeData(ByteSpan bytes, std::size_t depth) {
    out_ += "<data>\n";
    while (!bytes.empty()) {
      const ByteSpan line = bytes.first(std::min(bytes.size(), kDataBytesPerLine));
      bytes = bytes.subspan(line.size());
      out_.append(depth, '\t');
      appendBase64(out_, line);
      out_ += '\n';
    }
    out_.append(depth, '\t');
    close("data");
  }

  bool writeArray(const Array& array, std::size_t depth) {
    if (array.empty()) {
      out_ += "<array/>\n";
      return true;
    }
    out_ += "<array>\n";
    std::size_t index = 0;
    for (const Value& element : array) {
      if (!writeValue(element, depth + 1)) return guard_.under(index);
      ++index;
    }
    out_.append(depth, '\t');
    close("array");
    return true;
  }

  bool writeDictionary(const Dictionary& dictionary, std::size_t depth) {
    if (dictionary.empty()) {
      out_ += "<dict/>\n";
      return true;
    }
    out_ += "<dict>\n";
    const std::size_t first = entries_.push(dictionary);
    const std::size_t end = entries_.end();
    for (std::size_t i = first; i < end; ++i) {
      out_.append(depth + 1, '\t');
      open("key");
      appendXmlText(out_, entries_[i].key);
      close("key");
      if (!writeValue(*entries_[i].value, depth + 1)) return guard_.under(entries_[i].key);
    }
    entries_.popTo(first);
    out_.append(depth, '\t');
    close("dict");
    return true;
  }

  void open(std::string_view name) {
    out_ += '<';
    out_ += name;
    out_ += '>';
  }
  void close(std::string_view name) {
    out_ += "</";
    out_ += name;
    out_ += ">\n";
  }

  std::string out_;
  // No limit on values: each takes some bytes, and those are limited.
  EncodingGuard guard_{std::numeric_limits<std::size_t>::max()};
  SortedEntries entries_{Alphabet::Xml};
};

}  // namespace

Expected<std::string> writeXml(const Value& value) {
  return XmlWriter().write(value);
}

}  // namespace tavrel::plist
