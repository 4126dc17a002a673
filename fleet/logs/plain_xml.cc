#include "fleet/logs/plain_xml.h"

#include <array>
#include <bit>
#include <optional>
#include <string>

#include "base/copy_little.h"
#include "fleet/logs/xml_value.h"

namespace tavrel::fleet {
namespace {

// Characters that stand for themselves in a text.
constexpr std::array<bool, 256> kPlainCharacters = [] {
  std::array<bool, 256> plain{};
  for (int character = 0x20; character < 0x7F; ++character)
    plain[static_cast<std::size_t>(character)] = true;
  plain['\t'] = plain['\n'] = true;
  plain['<'] = plain['>'] = plain['&'] = false;
  return plain;
}();

constexpr std::size_t kWordBytes = sizeof(std::uint64_t);

// How many of the next eight characters, up to the first other one, are plain ASCII.
std::size_t plainInWord(const char* text) {
  constexpr std::uint64_t kOnes = 0x0101010101010101;
  std::uint64_t word = 0;
  copyLittle(&word, text, sizeof word);
  // Sets the top bit of the first byte, if any, that is less than the number.
  const auto less = [](std::uint64_t bytes, std::uint64_t number) {
    return (bytes - number * kOnes) & ~bytes;
  };
  const auto equals = [&](char character) {
    return less(word ^ static_cast<std::uint64_t>(character) * kOnes, 1);
  };
  const std::uint64_t others =
      word | less(word, 0x20) | equals('<') | equals('>') | equals('&') | equals('\x7F');
  return static_cast<std::size_t>(std::countr_zero(others & 0x80 * kOnes)) / 8;
}

class Reader {
 public:
  Reader(std::string_view document, LogBuilder& builder) : rest_(document), builder_(builder) {}

  PlainXml read() {
    take("<?xml version=\"1.0\" encoding=\"UTF-8\"?>");
    skipSpace();
    if (!take("<plist version=\"1.0\">")) return PlainXml::NotPlain;
    do {
      skipSpace();
      if (!readElement()) return outcome_;
    } while (!containers_.empty());
    skipSpace();
    if (!take("</plist>")) return PlainXml::NotPlain;
    skipSpace();
    return rest_.empty() ? PlainXml::Read : PlainXml::NotPlain;
  }

 private:
  // A template on the literal's size, so that the comparison is only a few instructions.
  template <std::size_t kSize>
  bool take(const char (&text)[kSize]) {
    constexpr std::size_t kLength = kSize - 1;
    if (rest_.size() < kLength || std::memcmp(rest_.data(), text, kLength) != 0) return false;
    rest_.remove_prefix(kLength);
    return true;
  }

  void skipSpace() {
    std::size_t size = 0;
    while (size < rest_.size() &&
           (rest_[size] == '\n' || rest_[size] == '\t' || rest_[size] == ' '))
      ++size;
    rest_.remove_prefix(size);
  }

  bool built(bool taken) {
    if (!taken) outcome_ = PlainXml::Refused;
    return taken;
  }

  // Reads one start tag with its text, or one end tag. False ends the reading.
  bool readElement() {
    if (rest_.size() < 2 || rest_[0] != '<') return false;
    switch (rest_[1]) {
      case '/':
        return readEnd();
      case 'k':
        return take("<key>") && readValue(XmlValue::Key, "</key>");
      case 'i':
        return take("<integer>") && readValue(XmlValue::Integer, "</integer>");
      case 'r':
        return take("<real>") && readValue(XmlValue::Real, "</real>");
      case 's':
        return take("<string>") && readValue(XmlValue::String, "</string>");
      case 'd':
        if (take("<dict>")) return begin(true);
        if (take("<dict/>")) return begin(true) && end();
        if (take("<date>")) return readValue(XmlValue::Date, "</date>");
        return take("<data>") && readValue(XmlValue::Data, "</data>");
      case 'a':
        if (take("<array>")) return begin(false);
        return take("<array/>") && begin(false) && end();
      case 't':
        return take("<true/>") && built(builder_.other());
      case 'f':
        return take("<false/>") && built(builder_.other());
      default:
        return false;
    }
  }

  bool begin(bool isDictionary) {
    containers_.push_back(isDictionary);
    return built(builder_.begin(isDictionary));
  }

  bool end() {
    containers_.pop_back();
    return built(builder_.end());
  }

  bool readEnd() {
    if (containers_.empty()) return false;
    return (containers_.back() ? take("</dict>") : take("</array>")) && end();
  }

  template <std::size_t kSize>
  bool readValue(XmlValue element, const char (&endTag)[kSize]) {
    const auto text = readText();
    return text && take(endTag) && built(buildValue(builder_, element, *text));
  }

  // The text up to the next tag; nothing when it is not plain.
  std::optional<std::string_view> readText() {
    std::size_t size = 0;
    while (true) {
      std::size_t plain = kWordBytes;
      while (plain == kWordBytes && rest_.size() - size >= kWordBytes)
        size += plain = plainInWord(rest_.data() + size);
      // A tab, a new line, or the last few characters.
      if (size == rest_.size() || !kPlainCharacters[static_cast<unsigned char>(rest_[size])]) break;
      ++size;
    }
    const std::string_view text = rest_.substr(0, size);
    rest_.remove_prefix(size);
    return rest_.starts_with('&') ? readReferences(text) : text;
  }

  // Reads the rest of a text in which references stand for XML's own characters.
  std::optional<std::string_view> readReferences(std::string_view beginning) {
    unescaped_ = beginning;
    while (!rest_.starts_with('<')) {
      if (take("&lt;")) {
        unescaped_ += '<';
      } else if (take("&gt;")) {
        unescaped_ += '>';
      } else if (take("&amp;")) {
        unescaped_ += '&';
      } else if (!rest_.empty() && kPlainCharacters[static_cast<unsigned char>(rest_.front())]) {
        unescaped_ += rest_.front();
        rest_.remove_prefix(1);
      } else {
        return std::nullopt;
      }
    }
    return unescaped_;
  }

  std::string_view rest_;
  LogBuilder& builder_;
  std::vector<bool> containers_;  // whether each is a dictionary
  std::string unescaped_;
  PlainXml outcome_ = PlainXml::NotPlain;
};

}  // namespace

PlainXml readPlainXml(std::string_view document, LogBuilder& builder) {
  return Reader(document, builder).read();
}

}  // namespace tavrel::fleet
