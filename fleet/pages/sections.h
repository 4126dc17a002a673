// The sections of a fleet's page.
#pragma once

#include <string>
#include <string_view>

#include "fleet/pages/fleet_page.h"
#include "page/html_writer.h"

namespace tavrel::fleet {

/// The most important facts in sentences.
void writeInShort(page::HtmlWriter& html, const FleetPage& page);
void writeFleet(page::HtmlWriter& html, const SummaryAnswer& summary);
void writeChanges(page::HtmlWriter& html, const CompareAnswer& comparison);
/// Says that there are `further` statistics, and those for which the section has no room.
void writeStatistics(page::HtmlWriter& html, const std::vector<ShowAnswer>& answers,
                     std::size_t further);

/// The short meaning of a key when it is known, else the key itself.
std::string nameOf(std::string_view key);
/// "20 % higher (120 ms → 144 ms)"; without the percentage when that rounds to 0.
std::string changeText(const Comparison& one);
/// "2 logs that have no mean, because ...".
std::string withoutMeanText(std::size_t logs, std::size_t devicesAtLeast);
/// Whether a percentile of a scalar, one of `kPercents`, is the lowest or the highest value, and so
/// that of a single device.
bool isOfOneDevice(const ShownSet& set, std::size_t index);
/// "1,234".
std::string countText(std::size_t count);
/// "1 statistic", "1,234 statistics".
std::string counted(std::size_t count, const std::string& what);

}  // namespace tavrel::fleet
