#include "fleet/loading/read_item.h"

#include <utility>

#include "fleet/logs/limits.h"
#include "fleet/sources/file_name.h"
#include "fleet/sources/limits.h"
#include "fleet/sources/sources.h"

namespace tavrel::fleet {
namespace {

using Kind = SourceItem::Kind;

void refuse(ReadItem& item, std::string reason) {
  item.source.kind = Kind::Refused;
  item.source.reason = std::move(reason);
}

// False when the log is refused or is of another kind.
bool takeSidecar(ReadItem& item) {
  SourceItem& source = item.source;
  if (!source.hasSidecar) return true;
  const auto bytes = readSourceFile(sidecarOf(source.path), limits::kMetadataBytes, false);
  const auto metadata =
      bytes ? readMetadataFile(asBytes(*bytes)) : Expected<LogMetadata>(bytes.error());
  if (!metadata) {
    refuse(item, "its metadata: " + metadata.error().message);
    return false;
  }
  source.metadata = *metadata;
  if (!isOtherLog(withoutGzip(fileNameOf(source.path)), &*metadata)) return true;
  source.kind = Kind::Other;
  return false;
}

}  // namespace

ReadItem readItem(SourceItem source, LogReader& reader, const PermittedKeys& permitted) {
  ReadItem item;
  item.source = std::move(source);
  if (item.source.kind == Kind::File) {
    if (!takeSidecar(item)) return item;
    auto bytes = readSourceFile(item.source.path, limits::kLogBytes, item.source.mayBeLink);
    if (!bytes) {
      refuse(item, bytes.error().message);
      return item;
    }
    item.source.content = *std::move(bytes);
  } else if (item.source.kind != Kind::Content) {
    return item;
  }
  auto record = reader.read(asBytes(item.source.content),
                            item.source.metadata ? &*item.source.metadata : nullptr);
  item.bytes = reader.documentBytes();
  if (!record) {
    refuse(item, record.error().message);
    return item;
  }
  if (!permitted.empty()) {
    std::string fault = permitted.faultOf(*record);
    if (!fault.empty()) {
      refuse(item, std::move(fault));
      return item;
    }
  }
  item.source.content = {};
  item.record = *std::move(record);
  return item;
}

}  // namespace tavrel::fleet
