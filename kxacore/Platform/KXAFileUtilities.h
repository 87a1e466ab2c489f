// File helpers the platform would otherwise provide.
//
// Thread safety: pure functions over the file system; concurrent writers of
// the same path each produce a whole file, the last rename wins.
#pragma once

#include <filesystem>
#include <string_view>

// Writes `contents` to a temporary file beside `path`, flushes it, then
// renames it over `path`, so readers see the old file or the new one and
// never a half-written one. Returns false (and removes the temporary file)
// on any failure; `path` is then untouched.
[[nodiscard]] bool KXAWriteFileAtomically(const std::filesystem::path& path,
                                          std::string_view contents);
