#include "fleet/logs/log_builder.h"

#include <cmath>
#include <limits>

#include "base/civil_time.h"
#include "base/format.h"
#include "base/instant.h"
#include "fleet/logs/five_numbers_check.h"
#include "fleet/logs/interval_label.h"
#include "fleet/logs/limits.h"
#include "fleet/logs/record_order.h"
#include "platform/tallied_log.h"

namespace tavrel::fleet {

// Members up to `Histograms` are mandatory.
enum class LogBuilder::Member : std::uint8_t {
  Version,
  StartDate,
  CreationDate,
  Scalars,
  Distributions,
  Histograms,
  Metadata,
  TaskID,
  WhitelistDigest,
  Applications,
  Unknown
};

namespace {

constexpr std::array<std::string_view, 10> kMembers = {
    kVersionMember,         kStartDateMember,   kCreationDateMember, kScalarsMember,
    kDistributionsMember,   kHistogramsMember,  kMetadataMember,     kTaskIDMember,
    kWhitelistDigestMember, kApplicationsMember};
constexpr std::size_t kRequiredMembers = 6;

constexpr std::size_t kShownBytes = 100;

// Shortens a long text for a message.
std::string_view shown(std::string_view text) {
  return text.substr(0, kShownBytes);
}

bool isUnknown(std::string_view text) {
  return text == kUnknownText || text == kNoTaskingID;
}

bool isInCalendar(plist::Date date) {
  const double days = date.secondsSince1970() / kSecondsPerDay;
  return days >= limits::kFirstDay && days < limits::kLastDay + 1;
}

}  // namespace

std::string LogBuilder::path() const {
  if (levels_.empty()) return {};
  std::string path(shown(memberName_));
  const Place place = levels_.back().place;
  if (place == Place::Root || place == Place::Skipped) return path;
  if (!entry_.empty()) path.append("/").append(shown(entry_));
  if (!inner_.empty()) path.append("/").append(shown(inner_));
  return path;
}

bool LogBuilder::fail(std::string_view reason) {
  fault_ = path();
  if (!fault_.empty()) fault_ += ": ";
  fault_ += reason;
  return false;
}

bool LogBuilder::wrongType() {
  const auto wanted = [&] {
    switch (levels_.back().place) {
      case Place::Scalars:
        return "an integer";
      case Place::Distributions:
        return "an array of five numbers";
      case Place::Numbers:
        return numberCount_ == 4 ? "a summary whose count is an integer"
                                 : "an array of five numbers";
      case Place::Cells:
        return "an integer";
      case Place::Root:
        break;
      default:
        return "a dictionary";
    }
    switch (member_) {
      case Member::Version:
        return "an integer";
      case Member::StartDate:
      case Member::CreationDate:
        return "a date";
      case Member::WhitelistDigest:
        return "a text";
      case Member::Applications:
        return "an array";
      default:
        return "a dictionary";
    }
  };
  return fail(format("is not %s", wanted()));
}

bool LogBuilder::keepText(std::string_view text, std::string_view& to) {
  if (text.size() > limits::kTextBytes) {
    return fail(format("has more than %zu bytes", limits::kTextBytes));
  }
  if (!isUnknown(text)) to = record_.texts.keep(text);
  return true;
}

bool LogBuilder::addRow() {
  if (++rows_ <= limits::kLogRows) return true;
  return fail(format("the log has more than %zu rows", limits::kLogRows));
}

// Whether the next value may be anything. Only a text is read as BHTaskID.
bool LogBuilder::isIgnored() const {
  const Place place = levels_.back().place;
  return place == Place::Skipped ||
         (place == Place::Root && (member_ == Member::TaskID || member_ == Member::Unknown));
}

// Checks that property lists allow a value here.
bool LogBuilder::takeValue() {
  if (levels_.empty()) {
    if (hasDocument_) return fail("there is a second value");
    hasDocument_ = true;
    return true;
  }
  Level& level = levels_.back();
  if (!level.isDictionary) return true;
  if (!level.hasKey) {
    // Not `fail`, which would name the place of an earlier value.
    fault_ = "a dictionary has a value without a key";
    return false;
  }
  level.hasKey = false;
  return true;
}

// The same for a value that is no container.
bool LogBuilder::takeSingleValue(std::string_view kind) {
  if (!takeValue()) return false;
  return !levels_.empty() || fail(format("is not a tallied log: it is %s", kind));
}

bool LogBuilder::key(std::string_view text) {
  if (levels_.empty() || !levels_.back().isDictionary) {
    return fail("a key is outside a dictionary");
  }
  Level& level = levels_.back();
  if (level.hasKey) return fail("a key has no value");
  level.hasKey = true;
  if (level.place == Place::Skipped) return true;
  if (text.size() > limits::kTextBytes) {
    return fail(format("a key has more than %zu bytes", limits::kTextBytes));
  }
  switch (level.place) {
    case Place::Root: {
      memberName_ = record_.texts.keep(text);
      std::uint8_t number = 0;
      while (number < kMembers.size() && kMembers[number] != text)
        ++number;
      member_ = static_cast<Member>(number);
      if (member_ == Member::Unknown) return true;
      if ((seen_ >> number & 1U) != 0) return fail("occurs twice");
      seen_ |= 1U << number;
      return true;
    }
    case Place::Scalars:
    case Place::Distributions:
    case Place::Histograms:
      entry_ = record_.texts.keep(text);
      return true;
    default:
      inner_ = record_.texts.keep(text);
      return true;
  }
}

bool LogBuilder::begin(bool isDictionary) {
  if (!takeValue()) return false;
  if (levels_.size() == limits::kDepth) {
    return fail(format("containers nest deeper than %zu", limits::kDepth));
  }
  Place inner = Place::Skipped;
  if (!beginIn(isDictionary, inner)) return false;
  levels_.push_back({inner, isDictionary});
  return true;
}

bool LogBuilder::beginIn(bool isDictionary, Place& inner) {
  if (levels_.empty()) {
    inner = Place::Root;
    return isDictionary || fail("is not a tallied log: it is an array");
  }
  if (isIgnored()) return true;
  return levels_.back().place == Place::Root ? beginRootMember(isDictionary, inner)
                                             : beginEntry(isDictionary, inner);
}

bool LogBuilder::beginRootMember(bool isDictionary, Place& inner) {
  switch (member_) {
    case Member::Metadata:
      inner = Place::Metadata;
      break;
    case Member::Scalars:
      inner = Place::Scalars;
      break;
    case Member::Distributions:
      inner = Place::Distributions;
      break;
    case Member::Histograms:
      inner = Place::Histograms;
      break;
    case Member::Applications:
      inner = Place::Applications;
      return !isDictionary || wrongType();
    default:
      return wrongType();
  }
  return isDictionary || wrongType();
}

bool LogBuilder::beginEntry(bool isDictionary, Place& inner) {
  switch (levels_.back().place) {
    case Place::Distributions:
      inner = Place::Numbers;
      numberCount_ = 0;
      return !isDictionary || wrongType();
    case Place::Histograms:
      inner = Place::Cells;
      return isDictionary || wrongType();
    case Place::Applications:
      if (!addRow()) return false;
      record_.applications.emplace_back();
      inner = Place::Application;
      return isDictionary || wrongType();
    case Place::Scalars:
    case Place::Numbers:
    case Place::Cells:
      return wrongType();
    default:
      return true;
  }
}

bool LogBuilder::end() {
  const Level level = levels_.back();
  if (level.hasKey) return fail("the last key of a dictionary has no value");
  if (level.place == Place::Numbers && !endNumbers()) return false;
  levels_.pop_back();
  inner_ = {};
  if (level.place != Place::Numbers && level.place != Place::Cells) entry_ = {};
  return true;
}

bool LogBuilder::endNumbers() {
  if (numberCount_ != 5) return fail("is not an array of five numbers");
  const FiveNumbers numbers = {numbers_[0], numbers_[1], numbers_[2], numbers_[3], count_};
  if (const char* const fault = faultOf(numbers)) return fail(fault);
  if (!addRow()) return false;
  record_.distributions.push_back({entry_, numbers});
  return true;
}

bool LogBuilder::addNumber(double number) {
  if (numberCount_ >= 4) {
    return wrongType();
  }
  // Not-a-number has many bit patterns; use one, so that equal logs have equal bits.
  numbers_[numberCount_++] = std::isnan(number) ? std::numeric_limits<double>::quiet_NaN() : number;
  return true;
}

bool LogBuilder::addCell(const plist::Number& count) {
  const auto interval = parseIntervalLabel(inner_);
  if (!interval) return fail("the label is not an interval");
  if (count.kind() == plist::NumberKind::UInt64 || count.int64() < 0) {
    return fail("the count is negative");
  }
  if (!addRow()) return false;
  record_.cells.push_back({entry_, interval->lower, interval->upper, inner_,
                           static_cast<std::uint64_t>(count.int64())});
  return true;
}

bool LogBuilder::integer(const plist::Number& number) {
  if (!takeSingleValue("a number")) return false;
  if (isIgnored()) return true;
  const bool isLarge = number.kind() == plist::NumberKind::UInt64;
  switch (levels_.back().place) {
    case Place::Root:
      if (member_ != Member::Version) return wrongType();
      return (!isLarge && number.int64() == 1) ||
             fail("is a version that this program does not know");
    case Place::Scalars:
      if (isLarge) return fail("exceeds 64 bits with a sign");
      if (!addRow()) return false;
      record_.scalars.push_back({entry_, number.int64()});
      return true;
    case Place::Numbers:
      if (numberCount_ != 4) return addNumber(number.real());
      if (isLarge || number.int64() < 0) return fail("its count is negative");
      count_ = static_cast<std::uint64_t>(number.int64());
      ++numberCount_;
      return true;
    case Place::Cells:
      return addCell(number);
    case Place::Application:
      if (inner_ == kAppOrboID) record_.applications.back().orboID = number.int64();
      if (inner_ == kAppArch) record_.applications.back().arch = number.int64();
      return true;
    case Place::Distributions:
    case Place::Histograms:
    case Place::Applications:
      return wrongType();
    default:
      return true;
  }
}

bool LogBuilder::real(double number) {
  if (!takeSingleValue("a number")) return false;
  if (isIgnored()) return true;
  return levels_.back().place == Place::Numbers ? addNumber(number) : wrongType();
}

bool LogBuilder::string(std::string_view text) {
  if (!takeSingleValue("a text")) return false;
  switch (levels_.back().place) {
    case Place::Root:
      if (member_ == Member::TaskID) return keepText(text, record_.taskID);
      if (member_ == Member::WhitelistDigest) return keepText(text, record_.whitelistDigest);
      return isIgnored() || wrongType();
    case Place::Metadata:
      if (inner_ == kLanguageKey) return keepText(text, record_.language);
      if (inner_ == kPreferredLanguageKey) {
        return keepText(text, record_.preferredLanguage);
      }
      return inner_ != kRegionKey || keepText(text, record_.region);
    case Place::Application: {
      ApplicationRow& application = record_.applications.back();
      if (inner_ == kAppBundle) return keepText(text, application.bundle);
      if (inner_ == kAppVersion) return keepText(text, application.version);
      return inner_ != kAppUuid || keepText(text, application.uuid);
    }
    default:
      return isIgnored() || wrongType();
  }
}

bool LogBuilder::date(plist::Date date) {
  if (!takeSingleValue("a date")) return false;
  if (isIgnored()) return true;
  if (levels_.back().place != Place::Root ||
      (member_ != Member::StartDate && member_ != Member::CreationDate)) {
    return wrongType();
  }
  if (!isInCalendar(date)) return fail("is not within the years 2000 to 2099");
  const std::int64_t seconds = wholeSeconds(date);
  if (member_ == Member::CreationDate) {
    record_.created = seconds;
    return true;
  }
  if (seconds % kSecondsPerDay != 0) return fail("is not the beginning of a day");
  record_.day = static_cast<std::int32_t>(seconds / kSecondsPerDay);
  return true;
}

bool LogBuilder::other() {
  return takeSingleValue("a single value") && (isIgnored() || wrongType());
}

bool LogBuilder::finish() {
  for (std::size_t number = 0; number < kRequiredMembers; ++number) {
    if ((seen_ >> number & 1U) == 0) {
      fault_ = format("is not a tallied log: it has no %s", kMembers[number]);
      return false;
    }
  }
  if (record_.created < std::int64_t{record_.day} * kSecondsPerDay) {
    fault_ = format("%s: is before the day that the log reports", kCreationDateMember);
    return false;
  }
  fault_ = putInOrder(record_);
  return fault_.empty();
}

}  // namespace tavrel::fleet
