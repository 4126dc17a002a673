// Report channels that measure how long states lasted.
#include <cmath>

#include "base/format.h"
#include "catalogue/catalogue.h"
#include "ioreport/elements.h"
#include "ioreport/ioreport.h"
#include "page/charts.h"
#include "page/number_text.h"
#include "tools/console/table.h"
#include "tools/page/sections.h"
#include "tools/report/report_quantity.h"
#include "tools/report/report_sampler.h"

namespace tavrel {
namespace {

constexpr SectionLimit kChannelLimit{150, 200'000};
// States shown per channel; the others are summed up.
constexpr std::size_t kStates = 24;

std::string_view textOr(std::optional<std::string_view> text) {
  return text.value_or(std::string_view());
}

// Having nothing to show is not a failure; the sampler names what it cannot sample.
std::vector<plist::Dictionary> sampledStates(ToolContext& context) {
  ReportSelection states;
  states.format = "state";
  Sampler sampler(context, states, Sampler::NoChannels::AreFine);
  if (!sampler) return {};
  const plist::Dictionary samples = sampler.sample();
  return samples ? channelsIn(samples) : std::vector<plist::Dictionary>();
}

std::vector<page::Share> sharesOf(const plist::Dictionary& channel) {
  const Elements states = elementsOfType(channel, kFormatState);
  const plist::Array names = stateNames(channel);
  const std::uint64_t total = totalResidency(states);
  std::vector<page::Share> shares;
  page::Share rest;
  for (std::size_t i = 0; i < states.count(); ++i) {
    const double duty = dutyCycle(states, i, total);
    if (std::isnan(duty)) return {};
    if (i >= kStates) {
      rest.share += duty;
      continue;
    }
    const auto name = names.at(i).string();
    const std::int64_t residency = states.value(i, kStateResidency);
    const auto time = residency < 0 ? std::nullopt : convertedValue(channel, residency);
    shares.push_back(
        {name ? std::string(*name) : format("state %zu", i), duty,
         time ? page::figureText(time->value, time->unit == "s" ? "seconds" : "") : std::string()});
  }
  if (states.count() > kStates) {
    rest.label = counted(states.count() - kStates, "more state");
    shares.push_back(std::move(rest));
  }
  return shares;
}

}  // namespace

void writeStates(PageScene& scene) {
  page::HtmlWriter& html = scene.document.section("Time in states");
  std::vector<std::pair<plist::Dictionary, std::vector<page::Share>>> channels;
  for (const plist::Dictionary& channel : sampledStates(scene.context)) {
    if (auto shares = sharesOf(channel); !shares.empty())
      channels.emplace_back(channel, std::move(shares));
  }
  if (channels.empty()) {
    html.element("p", "No driver of this device reports how long its states lasted.");
    return;
  }
  html.element("p", "How the time was spent since the drivers began to count.");
  html.begin("div", {{"class", "cards"}});
  std::size_t written = 0;
  for (; written < channels.size() && !kChannelLimit.isReached(written, html); ++written) {
    const auto& [channel, shares] = channels[written];
    const std::string_view driver = textOr(IOReportChannelGetDriverName(channel));
    const std::string_view group = textOr(IOReportChannelGetGroup(channel));
    const std::string_view name = textOr(IOReportChannelGetChannelName(channel));
    beginCard(html, name);
    html.name(name);
    const auto* entry = catalogue::findChannel(driver, group, name);
    if (entry && !entry->meaning.empty()) html.element("small", entry->meaning);
    html.end();
    html.begin("p", {{"class", "note"}});
    html.name(format("%s, %s", driver, group));
    html.end();
    page::writeShares(html, name, shares);
    html.end();
  }
  html.end();
  writeLeftOut(html, channels.size() - written, "channel",
               "tavrelctl report sample --format state");
}

}  // namespace tavrel
