// The floor of a run: the cost of its libraries for the same data, in a separate process.
//
//   tavrel_floor [xml FILE] [md5 FILE] [scalars DATABASE DAY]
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <expat.h>
#include <fstream>
#include <iterator>
#include <md5.h>
#include <sqlite3.h>
#include <string>
#include <string_view>

namespace {

[[noreturn]] void fail(const std::string& what) {
  std::fprintf(stderr, "tavrel_floor: %s\n", what.c_str());
  std::exit(1);
}

std::string contentOf(const char* path) {
  std::ifstream file(path, std::ios::binary);
  if (!file) fail(std::string("cannot read ") + path);
  return {std::istreambuf_iterator<char>(file), {}};
}

void parseXml(const std::string& text) {
  const XML_Parser parser = XML_ParserCreate(nullptr);
  XML_SetElementHandler(
      parser, [](void*, const XML_Char*, const XML_Char**) {}, [](void*, const XML_Char*) {});
  XML_SetCharacterDataHandler(parser, [](void*, const XML_Char*, int) {});
  if (XML_Parse(parser, text.data(), static_cast<int>(text.size()), XML_TRUE) != XML_STATUS_OK) {
    fail("cannot parse");
  }
  XML_ParserFree(parser);
}

void digest(const std::string& text) {
  MD5_CTX context;
  std::uint8_t result[MD5_DIGEST_LENGTH];
  MD5Init(&context);
  MD5Update(&context, reinterpret_cast<const std::uint8_t*>(text.data()), text.size());
  MD5Final(result, &context);
}

void readScalars(const char* path, const char* day) {
  sqlite3* database = nullptr;
  sqlite3_stmt* rows = nullptr;
  if (sqlite3_open_v2(path, &database, SQLITE_OPEN_READWRITE, nullptr) != SQLITE_OK ||
      sqlite3_prepare_v2(database, "SELECT key, value FROM scalars WHERE day = ?1", -1, &rows,
                         nullptr) != SQLITE_OK) {
    fail(sqlite3_errmsg(database));
  }
  sqlite3_bind_int64(rows, 1, std::strtoll(day, nullptr, 10));
  std::int64_t sum = 0;
  while (sqlite3_step(rows) == SQLITE_ROW)
    sum += sqlite3_column_int64(rows, 1) + sqlite3_column_bytes(rows, 0);
  if (sum == 0) fail("no scalars");
  sqlite3_finalize(rows);
  sqlite3_close(database);
}

}  // namespace

int main(int argc, char** argv) {
  for (int i = 1; i + 1 < argc;) {
    const std::string_view what = argv[i++];
    const char* const path = argv[i++];
    if (what == "xml") {
      parseXml(contentOf(path));
    } else if (what == "md5") {
      digest(contentOf(path));
    } else if (what == "scalars" && i < argc) {
      readScalars(path, argv[i++]);
    } else {
      fail("cannot do " + std::string(what));
    }
  }
}
