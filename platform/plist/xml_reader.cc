#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <exception>
#include <expat.h>
#include <memory>
#include <new>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/ascii.h"
#include "base/base64.h"
#include "base/format.h"
#include "base/iso_date.h"
#include "base/limits.h"
#include "platform/plist/encodable_text.h"
#include "platform/plist/scalar_text.h"
#include "platform/plist/xml.h"

namespace tavrel::plist {
namespace {

// Elements from Key to Data contain text.
enum class Element : std::uint8_t {
  None,
  Plist,
  Dict,
  Array,
  Key,
  String,
  Integer,
  Real,
  Date,
  Data,
  True,
  False
};

// Called at every start and end of an element, so the first letter decides which names to compare.
Element elementNamed(std::string_view name) {
  const auto either = [name](std::string_view one, Element oneElement, std::string_view other = {},
                             Element otherElement = Element::None) {
    return name == one ? oneElement : name == other ? otherElement : Element::None;
  };
  switch (name.empty() ? '\0' : name.front()) {
    case 'p':
      return either("plist", Element::Plist);
    case 'd':
      if (name.size() == 4 && name[1] == 'a') {
        return either("data", Element::Data, "date", Element::Date);
      }
      return either("dict", Element::Dict);
    case 'a':
      return either("array", Element::Array);
    case 'k':
      return either("key", Element::Key);
    case 's':
      return either("string", Element::String);
    case 'i':
      return either("integer", Element::Integer);
    case 'r':
      return either("real", Element::Real);
    case 't':
      return either("true", Element::True);
    case 'f':
      return either("false", Element::False);
    default:
      return Element::None;
  }
}

bool isSpace(char character) {
  return character == ' ' || character == '\t' || character == '\n' || character == '\r';
}

/// Shares the text of repeated keys: the dictionaries of a list mostly have the same keys.
class KeyTexts {
 public:
  String of(std::string_view text) {
    if (text.empty()) return {};
    const std::size_t place = text.size() * 7 +
                              std::size_t{static_cast<unsigned char>(text.front())} * 5 +
                              static_cast<unsigned char>(text.back());
    String& known = known_[place % known_.size()];
    if (known != text) known = String(text);
    return known;
  }

 private:
  std::array<String, 64> known_;
};

// Turns Expat's events into values as they come. The elements of open containers are gathered on
// one stack, so that each container is made once, with exactly the room it needs.
class XmlReader {
 public:
  Expected<Value> read(ByteSpan bytes);

  /// Runs `action` unless the parse has failed. Exceptions must not pass through the parser, which
  /// is C: one ends the parse, and is rethrown after it.
  template <class Action>
  void guarded(Action action) noexcept {
    if (failed_) return;
    try {
      action(*this);
    } catch (...) {
      failed_ = true;
      thrown_ = std::current_exception();
      XML_StopParser(parser_.get(), XML_FALSE);
    }
  }

  void startElement(std::string_view name);
  void endElement();
  void characters(std::string_view text);
  /// Ends the parse.
  void fail(std::string_view reason);

 private:
  struct Container {
    Element element;
    bool hasKey = false;     // a key on top of the stack waits for its value
    std::size_t firstEntry;  // in `entries_`
  };

  std::string located(std::string_view reason) const;
  void startValue(Element element, std::string_view name);
  void endScalar();
  void endContainer();
  void add(Value value);

  struct ParserDeleter {
    void operator()(XML_Parser parser) const { XML_ParserFree(parser); }
  };
  std::unique_ptr<std::remove_pointer_t<XML_Parser>, ParserDeleter> parser_;

  bool failed_ = false;
  std::string error_;
  std::exception_ptr thrown_;

  bool insidePlist_ = false;
  Element scalar_ = Element::None;  // the element whose text is being gathered
  std::string text_;
  KeyTexts keys_;
  std::vector<std::byte> data_;
  std::vector<Container> containers_;
  std::vector<Entry> entries_;  // the elements of arrays have empty keys
  std::size_t values_ = 0;
  Value root_;
};

void XMLCALL onStart(void* reader, const XML_Char* name, const XML_Char** /*attributes*/) noexcept {
  static_cast<XmlReader*>(reader)->guarded([&](XmlReader& self) { self.startElement(name); });
}
void XMLCALL onEnd(void* reader, const XML_Char* /*name*/) noexcept {
  static_cast<XmlReader*>(reader)->guarded([](XmlReader& self) { self.endElement(); });
}
void XMLCALL onCharacters(void* reader, const XML_Char* text, int length) noexcept {
  static_cast<XmlReader*>(reader)->guarded([&](XmlReader& self) {
    self.characters({text, static_cast<std::size_t>(length)});
  });
}
void XMLCALL onEntity(void* reader, const XML_Char* name, int, const XML_Char*, int,
                      const XML_Char*, const XML_Char*, const XML_Char*, const XML_Char*) noexcept {
  static_cast<XmlReader*>(reader)->guarded([&](XmlReader& self) {
    self.fail("entity \"" + excerpt(name) + "\" is declared; a property list may declare none");
  });
}
void XMLCALL onSkippedEntity(void* reader, const XML_Char* name, int) noexcept {
  static_cast<XmlReader*>(reader)->guarded(
      [&](XmlReader& self) { self.fail("entity \"" + excerpt(name) + "\" is not known"); });
}

Expected<Value> XmlReader::read(ByteSpan bytes) {
  if (bytes.size() > limits::kPropertyListBytes) {
    return Error{format("XML property list: it has %zu bytes; the limit is %zu", bytes.size(),
                        limits::kPropertyListBytes)};
  }
  parser_.reset(XML_ParserCreate(nullptr));
  if (!parser_) throw std::bad_alloc();
  XML_SetUserData(parser_.get(), this);
  XML_SetElementHandler(parser_.get(), onStart, onEnd);
  XML_SetCharacterDataHandler(parser_.get(), onCharacters);
  XML_SetEntityDeclHandler(parser_.get(), onEntity);
  XML_SetSkippedEntityHandler(parser_.get(), onSkippedEntity);

  const XML_Status status = XML_Parse(parser_.get(), reinterpret_cast<const char*>(bytes.data()),
                                      static_cast<int>(bytes.size()), XML_TRUE);
  if (thrown_) std::rethrow_exception(thrown_);
  if (failed_) return Error{std::move(error_)};
  if (status != XML_STATUS_OK) {
    const XML_Error code = XML_GetErrorCode(parser_.get());
    if (code == XML_ERROR_NO_MEMORY) throw std::bad_alloc();
    return Error{located(XML_ErrorString(code))};
  }
  return std::move(root_);
}

std::string XmlReader::located(std::string_view reason) const {
  return format("XML property list, line %zu, column %zu: %s",
                std::size_t{XML_GetCurrentLineNumber(parser_.get())},
                std::size_t{XML_GetCurrentColumnNumber(parser_.get())} + 1, reason);
}

void XmlReader::fail(std::string_view reason) {
  failed_ = true;
  error_ = located(reason);
  XML_StopParser(parser_.get(), XML_FALSE);
}

void XmlReader::startElement(std::string_view name) {
  const Element element = elementNamed(name);
  if (scalar_ != Element::None) {
    return fail("<" + excerpt(name) + "> found where only text may be");
  }
  if (element == Element::None) {
    return fail("<" + excerpt(name) + "> is not an element of property lists");
  }
  if ((element == Element::Plist) == insidePlist_) {
    return fail(insidePlist_ ? "<plist> is inside another <plist>"
                             : "<" + excerpt(name) + "> found where <plist> should be");
  }
  if (element == Element::Plist) {
    insidePlist_ = true;
  } else if (element == Element::Key) {
    if (containers_.empty() || containers_.back().element != Element::Dict) {
      return fail("<key> found outside <dict>");
    }
    if (containers_.back().hasKey) return fail("<key> found where the value of a key should be");
    scalar_ = Element::Key;
    text_.clear();
  } else {
    startValue(element, name);
  }
}

void XmlReader::startValue(Element element, std::string_view name) {
  if (containers_.empty()) {
    if (!root_.isNull()) return fail("<" + excerpt(name) + "> is a second value");
  } else if (containers_.back().element == Element::Dict && !containers_.back().hasKey) {
    return fail("<" + excerpt(name) + "> found where <key> should be");
  }
  if (++values_ > limits::kPropertyListValues) {
    return fail(format("there are more than %zu values", limits::kPropertyListValues));
  }
  if (element != Element::Dict && element != Element::Array) {
    scalar_ = element;
    text_.clear();
    return;
  }
  if (containers_.size() == limits::kPropertyListDepth) {
    return fail(format("containers nest deeper than %zu", limits::kPropertyListDepth));
  }
  containers_.push_back({.element = element, .firstEntry = entries_.size()});
}

void XmlReader::endElement() {
  if (scalar_ != Element::None) {
    endScalar();
  } else if (!containers_.empty()) {
    endContainer();
  } else if (root_.isNull()) {
    fail("<plist> contains no value");
  }
}

void XmlReader::endScalar() {
  switch (std::exchange(scalar_, Element::None)) {
    case Element::Key:
      entries_.push_back({keys_.of(text_), Value()});
      containers_.back().hasKey = true;
      return;
    case Element::String:
      return add(text_);
    case Element::Integer:
      if (const auto number = parseInteger(trimmed(text_))) return add(*number);
      return fail("\"" + excerpt(text_) + "\" is not a 64-bit integer");
    case Element::Real:
      if (const auto number = parseReal(trimmed(text_))) return add(*number);
      return fail("\"" + excerpt(text_) + "\" is not a number in the range of a double");
    case Element::Date:
      if (const auto date = parseIsoInstant(trimmed(text_))) return add(*date);
      return fail("\"" + excerpt(text_) +
                  "\" is not a date: give one that exists, as YYYY-MM-DDTHH:MM:SSZ");
    case Element::Data:
      if (readBase64(text_, data_)) return add(Data(data_));
      return fail("the text of <data> is not base64");
    case Element::True:
      return add(true);
    default:
      return add(false);
  }
}

void XmlReader::endContainer() {
  const Container container = containers_.back();
  if (container.hasKey) return fail("the last <key> of a <dict> has no value");
  containers_.pop_back();
  const auto first = entries_.begin() + static_cast<std::ptrdiff_t>(container.firstEntry);
  const auto count = static_cast<std::size_t>(entries_.end() - first);
  Value value;
  if (container.element == Element::Dict) {
    Dictionary dictionary = Dictionary::create(count);
    for (auto entry = first; entry != entries_.end(); ++entry)
      dictionary.set(entry->key, std::move(entry->value));
    value = dictionary;
  } else {
    Array array = Array::create(count);
    for (auto entry = first; entry != entries_.end(); ++entry)
      array.append(std::move(entry->value));
    value = array;
  }
  entries_.erase(first, entries_.end());
  add(std::move(value));
}

void XmlReader::add(Value value) {
  if (containers_.empty()) {
    root_ = std::move(value);
  } else if (containers_.back().element == Element::Dict) {
    entries_.back().value = std::move(value);
    containers_.back().hasKey = false;
  } else {
    entries_.push_back({String(), std::move(value)});
  }
}

void XmlReader::characters(std::string_view text) {
  if (scalar_ >= Element::Key && scalar_ <= Element::Data) {
    text_.append(text);
  } else if (!std::ranges::all_of(text, isSpace)) {
    fail("text found outside an element that contains text");
  }
}

}  // namespace

Expected<Value> readXml(ByteSpan bytes) {
  return XmlReader().read(bytes);
}

}  // namespace tavrel::plist
