// A small valid log, and variations of its text.
#pragma once

#include <gtest/gtest.h>
#include <string>
#include <string_view>
#include <zlib.h>

namespace tavrel::fleet {

inline const std::string kSampleLog = R"(<?xml version="1.0" encoding="UTF-8"?>
<plist version="1.0">
<dict>
	<key>BHActivatedAppInfo</key>
	<array>
		<dict>
			<key>arch</key>
			<integer>3</integer>
			<key>bundle</key>
			<string>com.example.walk</string>
			<key>orboID</key>
			<integer>-7</integer>
			<key>uuid</key>
			<string>8D1F6C0E-55B5-4B0A-9C6B-0D1A53F3A1C2</string>
			<key>version</key>
			<string>1.2</string>
		</dict>
	</array>
	<key>BHCrashLogVersion</key>
	<integer>1</integer>
	<key>BHDistributions</key>
	<dict>
		<key>com.example.delay</key>
		<array>
			<real>1</real>
			<real>250</real>
			<real>67.875</real>
			<real>44257.1875</real>
			<integer>4</integer>
		</array>
		<key>com.example.load</key>
		<array>
			<real>nan</real>
			<real>nan</real>
			<real>nan</real>
			<real>0</real>
			<integer>1</integer>
		</array>
	</dict>
	<key>BHDistributionsHistogram</key>
	<dict>
		<key>com.example.delay</key>
		<dict>
			<key>(-inf, 2.5]</key>
			<integer>1</integer>
			<key>(100, inf)</key>
			<integer>1</integer>
			<key>(2.5, 100]</key>
			<integer>2</integer>
		</dict>
	</dict>
	<key>BHLogCreationDate</key>
	<date>2026-11-25T03:04:05Z</date>
	<key>BHMetadata</key>
	<dict>
		<key>BHPreferredUserInterfaceLanguage</key>
		<string>de-AT</string>
		<key>BHUserInterfaceLanguage</key>
		<string>&lt;unknown&gt;</string>
		<key>BHUserSetRegionFormat</key>
		<string>AT</string>
	</dict>
	<key>BHScalars</key>
	<dict>
		<key>com.example.a&lt;b&amp;c</key>
		<integer>-9223372036854775808</integer>
		<key>com.example.starts</key>
		<integer>12000</integer>
	</dict>
	<key>BHStartDate</key>
	<date>2026-11-24T00:00:00Z</date>
	<key>BHTaskDigest</key>
	<string>(no tasking digest)</string>
	<key>BHTaskID</key>
	<string>(no tasking id)</string>
	<key>BHTasking</key>
	<array/>
	<key>BHWhitelistDigest</key>
	<string>eb42570d2e2f7addc42403d203dafde4</string>
</dict>
</plist>
)";

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
