// The answers of tavrel-fleet show as text, JSON and CSV.
#pragma once

#include <iosfwd>
#include <string>
#include <vector>

#include "fleet/commands/fleet_context.h"
#include "fleet/questions/show.h"

namespace tavrel::fleet {

/// With `buckets`, prints the histograms of all parts instead of their figures.
void printShown(FleetContext& context, const ShowAnswer& answer, bool buckets);
Json shownJson(const ShowAnswer& answer);
/// A row for each part.
void printShownCsv(std::ostream& out, const std::vector<ShowAnswer>& answers);
/// A row for each bucket of each part.
void printBucketsCsv(std::ostream& out, const std::vector<ShowAnswer>& answers);

/// "(10, 20]", and "(20, inf)" for the last bucket, as in a log.
std::string bucketText(double lower, double upper);

}  // namespace tavrel::fleet
