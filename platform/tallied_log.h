// Names in a tallied log, the daemon's log of one day, and in the metadata that is filed with each
// log. docs/log.md and docs/files.md describe them.
#pragma once

#include <string_view>

namespace tavrel {

/// The name under which the submission service files tallied logs.
inline constexpr std::string_view kTalliedLogName = "log-tallied";

/// Members of a tallied log.
inline constexpr std::string_view kVersionMember = "BHCrashLogVersion";            // integer
inline constexpr std::string_view kStartDateMember = "BHStartDate";                // date
inline constexpr std::string_view kCreationDateMember = "BHLogCreationDate";       // date
inline constexpr std::string_view kMetadataMember = "BHMetadata";                  // dictionary
inline constexpr std::string_view kScalarsMember = "BHScalars";                    // dictionary
inline constexpr std::string_view kDistributionsMember = "BHDistributions";        // dictionary
inline constexpr std::string_view kHistogramsMember = "BHDistributionsHistogram";  // dictionary
inline constexpr std::string_view kTaskingMember = "BHTasking";                    // array
inline constexpr std::string_view kTaskIDMember = "BHTaskID";                      // any
inline constexpr std::string_view kTaskDigestMember = "BHTaskDigest";              // any
inline constexpr std::string_view kWhitelistDigestMember = "BHWhitelistDigest";    // string
inline constexpr std::string_view kApplicationsMember = "BHActivatedAppInfo";  // array, when given

/// Strings in `kMetadataMember`.
inline constexpr std::string_view kLanguageKey = "BHUserInterfaceLanguage";
inline constexpr std::string_view kPreferredLanguageKey = "BHPreferredUserInterfaceLanguage";
inline constexpr std::string_view kRegionKey = "BHUserSetRegionFormat";

/// Members of an application.
inline constexpr std::string_view kAppBundle = "bundle";    // string
inline constexpr std::string_view kAppVersion = "version";  // string
inline constexpr std::string_view kAppUuid = "uuid";        // string
inline constexpr std::string_view kAppOrboID = "orboID";    // integer
inline constexpr std::string_view kAppArch = "arch";        // integer

/// Stand for a text and for a tasking's identifier that the device does not know.
inline constexpr std::string_view kUnknownText = "<unknown>";
inline constexpr std::string_view kNoTaskingID = "(no tasking id)";

/// Entries of a filed log's metadata.
inline constexpr std::string_view kLogMetadataType = "LogType";       // string
inline constexpr std::string_view kLogMetadataName = "LogName";       // string
inline constexpr std::string_view kLogMetadataTime = "Time";          // date
inline constexpr std::string_view kLogMetadataVersion = "OSVersion";  // string
inline constexpr std::string_view kLogMetadataOptions = "Options";    // dictionary, when given

/// Strings in the options of a tallied log.
inline constexpr std::string_view kPreviousOSVersionOption = "previous_os_version";
inline constexpr std::string_view kConfigNumberOption = "ConfigNumber";

inline constexpr std::string_view kLogEnding = ".log";
/// The ending of a log's metadata file, whose name otherwise equals the log's.
inline constexpr std::string_view kLogMetadataEnding = ".metadata.plist";

}  // namespace tavrel
