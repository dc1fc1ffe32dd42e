// Whole-file reads and writes, and descriptor I/O that survives EINTR and short counts.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace qr {

// The file's bytes; none when it cannot be opened or read.
std::optional<std::string> readFile(const std::string& path);
// Creates or truncates the file and writes the bytes in place.
bool writeFile(const std::string& path, std::string_view bytes);
// Writes every byte, retrying interrupted calls and short counts.
bool writeAll(int fd, std::string_view bytes);
// Reads until end of file; false on an error other than EINTR (what was read stays in out).
bool readAll(int fd, std::string& out);

bool isDirectory(const std::string& path);
bool isReadableFile(const std::string& path);

}  // namespace qr
