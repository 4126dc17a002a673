// Builds a record of a log from the events of a property-list reader, in one pass.
//
//   LogBuilder builder(record);
//   builder.begin(true); builder.key("BHScalars"); ... builder.end();
//   if (!builder.finish()) refuse(builder.fault());
//
// Every operation returns false when the log is refused; then `fault` has the reason, and only it
// may still be called. Texts are copied.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "base/plist.h"
#include "fleet/model/log_record.h"

namespace tavrel::fleet {

class LogBuilder {
 public:
  /// Fills `record`, which must be empty.
  explicit LogBuilder(LogRecord& record) : record_(record) {}

  bool begin(bool isDictionary);
  bool end();
  bool key(std::string_view text);
  bool string(std::string_view text);
  bool integer(const plist::Number& number);
  bool real(double number);
  bool date(plist::Date date);
  /// A boolean or data, which no entry that is read may be.
  bool other();

  /// Call it after the last event.
  bool finish();

  /// Refuses the log, naming the place that is being read.
  bool fail(std::string_view reason);
  const std::string& fault() const { return fault_; }

 private:
  enum class Place : std::uint8_t {
    Root,
    Metadata,
    Scalars,
    Distributions,
    Numbers,
    Histograms,
    Cells,
    Applications,
    Application,
    Skipped
  };
  struct Level {
    Place place;
    bool isDictionary;
    bool hasKey = false;
  };
  enum class Member : std::uint8_t;

  bool isIgnored() const;
  bool takeValue();
  bool takeSingleValue(std::string_view kind);
  bool beginIn(bool isDictionary, Place& inner);
  bool beginRootMember(bool isDictionary, Place& inner);
  bool beginEntry(bool isDictionary, Place& inner);
  bool endNumbers();
  bool addRow();
  bool addCell(const plist::Number& count);
  bool addNumber(double number);
  bool wrongType();
  bool keepText(std::string_view text, std::string_view& to);
  std::string path() const;

  LogRecord& record_;
  std::vector<Level> levels_;
  bool hasDocument_ = false;
  std::uint32_t seen_ = 0;  // members of the root, a bit for each number
  Member member_{};
  std::string_view memberName_;
  std::string_view entry_;  // of a section; points into the record's texts
  std::string_view inner_;  // the key inside an entry or an application; valid until its value
  std::array<double, 4> numbers_{};
  std::uint64_t count_ = 0;
  std::size_t numberCount_ = 0;
  std::size_t rows_ = 0;
  std::string fault_;
};

}  // namespace tavrel::fleet
