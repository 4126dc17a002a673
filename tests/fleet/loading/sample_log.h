// A small valid log, and variations of its text.
#pragma once

#include <cmath>
#include <gtest/gtest.h>
#include <string>
#include <string_view>
#include <zlib.h>

#include "base/iso_date.h"
#include "platform/plist/xml.h"

namespace tavrel::fleet {

/// As a device writes it.
inline const std::string kSampleLog = *plist::writeXml(plist::Dictionary{
    {"BHActivatedAppInfo",
     plist::Array{plist::Dictionary{{"arch", 3},
                                    {"bundle", "app.walk"},
                                    {"orboID", -7},
                                    {"uuid", "8D1F6C0E-55B5-4B0A-9C6B-0D1A53F3A1C2"},
                                    {"version", "1.2"}}}},
    {"BHCrashLogVersion", 1},
    {"BHDistributions",
     plist::Dictionary{{"app.delay", plist::Array{1.0, 250.0, 67.875, 44257.1875, 4}},
                       {"app.load", plist::Array{NAN, NAN, NAN, 0.0, 1}}}},
    {"BHDistributionsHistogram",
     plist::Dictionary{
         {"app.delay",
          plist::Dictionary{{"(-inf, 2.5]", 1}, {"(100, inf)", 1}, {"(2.5, 100]", 2}}}}},
    {"BHLogCreationDate", *parseIsoDate("2026-11-25T03:04:05Z")},
    {"BHMetadata", plist::Dictionary{{"BHPreferredUserInterfaceLanguage", "de-AT"},
                                     {"BHUserInterfaceLanguage", "<unknown>"},
                                     {"BHUserSetRegionFormat", "AT"}}},
    {"BHScalars", plist::Dictionary{{"app.a<b&c", INT64_MIN}, {"app.starts", 12000}}},
    {"BHStartDate", *parseIsoDate("2026-11-24T00:00:00Z")},
    {"BHTaskDigest", "(no tasking digest)"},
    {"BHTaskID", "(no tasking id)"},
    {"BHTasking", plist::Array::create()},
    {"BHWhitelistDigest", "eb42570d2e2f7addc42403d203dafde4"}});

/// `text` with the first `old` replaced.
inline std::string changed(std::string text, std::string_view old, std::string_view replacement) {
  const std::size_t at = text.find(old);
  EXPECT_NE(at, std::string::npos) << old;
  return text.replace(at, old.size(), replacement);
}

/// The sample from another device, identified by its count of starts.
inline std::string sampleLog(int starts) {
  return changed(kSampleLog, "12000", std::to_string(starts));
}

inline std::string gzipped(const std::string& text) {
  z_stream stream{};
  EXPECT_EQ(deflateInit2(&stream, 9, Z_DEFLATED, MAX_WBITS + 16, 9, Z_DEFAULT_STRATEGY), Z_OK);
  std::string out(deflateBound(&stream, text.size()) + 32, '\0');
  std::string in = text;
  stream.next_in = reinterpret_cast<Bytef*>(in.data());
  stream.avail_in = static_cast<uInt>(in.size());
  stream.next_out = reinterpret_cast<Bytef*>(out.data());
  stream.avail_out = static_cast<uInt>(out.size());
  EXPECT_EQ(deflate(&stream, Z_FINISH), Z_STREAM_END);
  out.resize(stream.total_out);
  deflateEnd(&stream);
  return out;
}

}  // namespace tavrel::fleet
