#include "tools/shared/input_file.h"

#include <fstream>
#include <istream>
#include <iterator>
#include <sys/stat.h>

#include "base/format.h"
#include "base/limits.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/files/system_error.h"
#include "platform/linux/linux_platform.h"
#include "platform/plist/coding.h"
#include "tools/console/json_value.h"

namespace tavrel {
namespace {

Error tooLarge(std::string_view name, std::size_t largest) {
  return Error{format("%s: more than %zu bytes: give a smaller one", name, largest)};
}

Expected<std::string> readStream(std::istream& in, std::string_view name, std::size_t largest) {
  std::string bytes;
  constexpr std::size_t kBlock = 64U << 10;
  while (in) {
    const std::size_t before = bytes.size();
    bytes.resize(before + kBlock);
    in.read(bytes.data() + before, kBlock);
    bytes.resize(before + static_cast<std::size_t>(in.gcount()));
    if (bytes.size() > largest) return tooLarge(name, largest);
  }
  if (in.bad()) return systemError("read", name);
  return bytes;
}

// A property list in either encoding begins with other characters.
bool looksLikeJson(std::string_view bytes) {
  if (bytes.starts_with("\xEF\xBB\xBF")) bytes.remove_prefix(3);
  const std::size_t first = bytes.find_first_not_of(" \t\r\n");
  return first != std::string_view::npos &&
         std::string_view("{[\"-0123456789tfn").find(bytes[first]) != std::string_view::npos;
}

}  // namespace

Expected<std::string> readInput(ToolContext& context, const std::string& file,
                                std::size_t largest) {
  if (file == "-") return readStream(context.in(), "standard input", largest);
  const auto status = FileSystem::status(file);
  if (status && S_ISDIR(status->st_mode)) {
    return Error{
        format("cannot read %s: it is a folder: give a file, or - for standard input", file)};
  }
  // A shell turns <(command) into a pipe.
  if (status && !S_ISREG(status->st_mode)) {
    std::ifstream in(file, std::ios::binary);
    if (!in) return systemError("read", file);
    return readStream(in, file, largest);
  }
  if (status && static_cast<std::uint64_t>(status->st_size) > largest) {
    return tooLarge(file, largest);
  }
  return context.linuxPlatform().fileSystem().read(file, largest);
}

Expected<plist::Value> decodeDocument(std::string_view bytes, std::string_view name) {
  const bool isJson = looksLikeJson(bytes);
  if (!isJson && !plist::isPropertyList(asBytes(bytes))) {
    return Error{format("%s: neither a property list nor JSON: %s", name,
                        bytes.empty() ? "the document is empty"
                                      : "it begins neither with \"bplist00\" nor with \"<\", \"{\" "
                                        "or \"[\"")};
  }
  auto value = isJson ? parseJsonValue(bytes) : plist::read(asBytes(bytes));
  if (!value) return Error{format("%s: %s", name, value.error().message)};
  return value;
}

Expected<plist::Value> readDocument(ToolContext& context, const std::string& file) {
  const auto bytes = readInput(context, file, limits::kPropertyListBytes);
  if (!bytes) return bytes.error();
  return decodeDocument(*bytes, file == "-" ? "standard input" : file);
}

}  // namespace tavrel
