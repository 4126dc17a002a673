#include "fleet/logs/expat_xml.h"

#include <array>
#include <exception>
#include <expat.h>
#include <new>
#include <optional>
#include <utility>

#include "base/format.h"
#include "fleet/logs/xml_value.h"

namespace tavrel::fleet {
namespace {

constexpr std::array<std::pair<std::string_view, XmlValue>, 6> kValues = {{
    {"key", XmlValue::Key},
    {"string", XmlValue::String},
    {"integer", XmlValue::Integer},
    {"real", XmlValue::Real},
    {"date", XmlValue::Date},
    {"data", XmlValue::Data},
}};

bool isSpace(std::string_view text) {
  return text.find_first_not_of(" \t\n\r") == std::string_view::npos;
}

bool isUtf8(std::string_view encoding) {
  constexpr std::string_view kName = "utf-8";
  if (encoding.size() != kName.size()) return false;
  for (std::size_t i = 0; i < kName.size(); ++i) {
    const char letter = encoding[i];
    if ((letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter + 32) : letter) != kName[i]) {
      return false;
    }
  }
  return true;
}

class Reading {
 public:
  Reading(XML_Parser parser, LogBuilder& builder) : parser_(parser), builder_(builder) {}

  // No exception may pass through the parser, which is C: it is rethrown after the parse.
  template <class Action>
  void guarded(Action action) noexcept {
    if (stopped_) return;
    try {
      if (!action(*this) && !stopped_) stop(builder_.fault());
    } catch (...) {
      thrown_ = std::current_exception();
      stop({});
    }
  }

  std::string result(XML_Status status, std::size_t size) {
    if (thrown_) std::rethrow_exception(thrown_);
    if (stopped_) return std::move(reason_);
    if (status == XML_STATUS_OK) return {};
    const XML_Error code = XML_GetErrorCode(parser_);
    if (code == XML_ERROR_NO_MEMORY) throw std::bad_alloc();
    if (code == XML_ERROR_NO_ELEMENTS || code == XML_ERROR_UNCLOSED_TOKEN ||
        code == XML_ERROR_PARTIAL_CHAR || code == XML_ERROR_UNCLOSED_CDATA_SECTION) {
      return format("is cut short: the property list does not end within its %zu bytes", size);
    }
    return located(XML_ErrorString(code));
  }

  bool declaration(const char* encoding) {
    if (encoding == nullptr || isUtf8(encoding)) return true;
    return stop(format("is in the encoding \"%s\": only UTF-8 is read", encoding));
  }

  bool start(std::string_view name) {
    if (value_) return stop(located("an element is inside a value"));
    if (name == "plist") {
      if (insidePlist_) return stop(located("<plist> is inside another one"));
      return insidePlist_ = true;
    }
    if (!insidePlist_) return stop("is not a property list: it begins with another element");
    if (name == "dict" || name == "array") return builder_.begin(name == "dict");
    if (name == "true" || name == "false") {
      isEmpty_ = true;
      return builder_.other();
    }
    for (const auto& [known, value] : kValues) {
      if (name != known) continue;
      value_ = value;
      text_.clear();
      return true;
    }
    return stop(located("an element is not one of property lists"));
  }

  bool end(std::string_view name) {
    if (value_) return buildValue(builder_, *std::exchange(value_, std::nullopt), text_);
    if (std::exchange(isEmpty_, false)) return true;
    return name == "plist" || builder_.end();
  }

  bool characters(std::string_view text) {
    if (value_) {
      text_.append(text);
      return true;
    }
    return isSpace(text) || stop(located("text is outside a value"));
  }

  bool stop(std::string reason) {
    stopped_ = true;
    reason_ = std::move(reason);
    XML_StopParser(parser_, XML_FALSE);
    return false;
  }

 private:
  std::string located(std::string_view reason) const {
    return format("line %zu, column %zu: %s", std::size_t{XML_GetCurrentLineNumber(parser_)},
                  std::size_t{XML_GetCurrentColumnNumber(parser_)} + 1, reason);
  }

  XML_Parser parser_;
  LogBuilder& builder_;
  std::optional<XmlValue> value_;  // the element whose text is being gathered
  bool isEmpty_ = false;           // inside <true/> or <false/>
  bool insidePlist_ = false;
  bool stopped_ = false;
  std::string text_;
  std::string reason_;
  std::exception_ptr thrown_;
};

template <class Action>
void with(void* reading, Action action) noexcept {
  static_cast<Reading*>(reading)->guarded(action);
}

void XMLCALL onDeclaration(void* reading, const XML_Char* /*version*/, const XML_Char* encoding,
                           int /*standalone*/) {
  with(reading, [&](Reading& self) { return self.declaration(encoding); });
}
void XMLCALL onStart(void* reading, const XML_Char* name, const XML_Char** /*attributes*/) {
  with(reading, [&](Reading& self) { return self.start(name); });
}
void XMLCALL onEnd(void* reading, const XML_Char* name) {
  with(reading, [&](Reading& self) { return self.end(name); });
}
void XMLCALL onCharacters(void* reading, const XML_Char* text, int length) {
  with(reading, [&](Reading& self) {
    return self.characters({text, static_cast<std::size_t>(length)});
  });
}
void XMLCALL onEntity(void* reading, const XML_Char*, int, const XML_Char*, int, const XML_Char*,
                      const XML_Char*, const XML_Char*, const XML_Char*) {
  with(reading, [](Reading& self) { return self.stop("declares an entity"); });
}
void XMLCALL onSkippedEntity(void* reading, const XML_Char*, int) {
  with(reading, [](Reading& self) { return self.stop("has an unknown entity"); });
}

// Such documents are refused here, because Expat would recognise and convert them.
bool isUtf16(ByteSpan document) {
  const std::string_view beginning = asText(document).substr(0, 2);
  return beginning.size() == 2 && (beginning == "\xFE\xFF" || beginning == "\xFF\xFE" ||
                                   beginning[0] == '\0' || beginning[1] == '\0');
}

}  // namespace

void ExpatXml::Deleter::operator()(XML_ParserStruct* parser) const {
  XML_ParserFree(parser);
}

std::string ExpatXml::read(ByteSpan document, LogBuilder& builder) {
  if (isUtf16(document)) return "is in the encoding \"UTF-16\": only UTF-8 is read";
  if (!parser_) {
    parser_.reset(XML_ParserCreate(nullptr));
    if (!parser_) throw std::bad_alloc();
  } else {
    XML_ParserReset(parser_.get(), nullptr);
  }
  XML_Parser parser = parser_.get();
  Reading reading(parser, builder);
  XML_SetUserData(parser, &reading);
  XML_SetXmlDeclHandler(parser, onDeclaration);
  XML_SetElementHandler(parser, onStart, onEnd);
  XML_SetCharacterDataHandler(parser, onCharacters);
  XML_SetEntityDeclHandler(parser, onEntity);
  XML_SetSkippedEntityHandler(parser, onSkippedEntity);
  const XML_Status status = XML_Parse(parser, reinterpret_cast<const char*>(document.data()),
                                      static_cast<int>(document.size()), XML_TRUE);
  return reading.result(status, document.size());
}

}  // namespace tavrel::fleet
