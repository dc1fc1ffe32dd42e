// Scratch directories, files and environment changes that tests undo when they end.
#pragma once

#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace qrtest {

// Writes a file, creating its parent directories.
inline void writeText(const std::string& path, std::string_view text) {
  std::filesystem::create_directories(std::filesystem::path(path).parent_path());
  std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
}

inline std::string readText(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), {});
}

// A temporary directory for one test, removed with everything in it.
class TempDir {
 public:
  explicit TempDir(const std::filesystem::path& base = std::filesystem::temp_directory_path())
      : path_((base / "quarrin-test-XXXXXX").string()) {
    if (!::mkdtemp(path_.data())) std::abort();
  }
  ~TempDir() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;

  const std::string& path() const { return path_; }
  std::string operator/(std::string_view relative) const { return path_ + "/" += relative; }
  // Writes a file inside the directory and gives its full path.
  std::string write(std::string_view relative, std::string_view bytes) const {
    writeText(*this / relative, bytes);
    return *this / relative;
  }

 private:
  std::string path_;
};

// Memory-backed scratch space where there is some: tests that sync files
// thousands of times run the same code there without waiting for a disk.
inline std::filesystem::path memoryBackedTempBase() {
  return ::access("/dev/shm", W_OK) == 0 ? "/dev/shm" : std::filesystem::temp_directory_path();
}

// Sets or unsets environment variables and restores them on destruction.
class EnvGuard {
 public:
  ~EnvGuard() {
    for (auto it = saved_.rbegin(); it != saved_.rend(); ++it) apply(it->first, it->second);
  }
  void set(const std::string& name, const std::optional<std::string>& value) {
    const char* old = ::getenv(name.c_str());
    saved_.emplace_back(name, old ? std::optional<std::string>(old) : std::nullopt);
    apply(name, value);
  }

 private:
  static void apply(const std::string& name, const std::optional<std::string>& value) {
    value ? ::setenv(name.c_str(), value->c_str(), 1) : ::unsetenv(name.c_str());
  }
  std::vector<std::pair<std::string, std::optional<std::string>>> saved_;
};

// An XML Info dictionary with the given short version (none when empty) and
// any further "<key>...</key><...>" lines.
inline std::string infoPlist(std::string_view identifier, std::string_view version,
                             std::string_view extra = {}) {
  std::string xml =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n"
      "\t<key>CFBundleIdentifier</key>\n\t<string>" +
      std::string(identifier) + "</string>\n";
  if (!version.empty())
    xml += "\t<key>CFBundleShortVersionString</key>\n\t<string>" + std::string(version) +
           "</string>\n";
  return xml + std::string(extra) + "</dict>\n</plist>\n";
}

}  // namespace qrtest
