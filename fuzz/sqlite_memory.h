// Memory for SQLite, which allocates thousands of blocks for each input: ASan's allocator would
// take longer than everything else. As there, a block is readable only while it is allocated and
// only within its bounds, rounded up to 8 bytes as SQLite's own are.
#pragma once

#include <cstddef>

namespace tavrel::fuzz {

/// Makes SQLite use this memory; before its first use.
void setUpSqliteMemory();

/// How many blocks SQLite holds; none once everything of an input is closed.
std::size_t sqliteBlocks();

}  // namespace tavrel::fuzz
