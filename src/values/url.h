// URLs, chiefly file URLs of bundle directories. A URL keeps the string it was
// made from and an optional base; two URLs are equal when both match, so
// registries that want one key per location use absoluteURL().
#pragma once

#include <atomic>
#include <optional>
#include <string>
#include <string_view>

#include "values/object.h"

namespace qr {

class URL final : public Object {
 public:
  // A file URL for a path. A relative path is taken relative to the current
  // directory; isDirectory gives the URL a trailing "/".
  static Ref<URL> fileURL(std::string_view path, bool isDirectory);
  // A file URL for a POSIX path relative to base; an absolute path stands for itself.
  static Ref<URL> fileURL(std::string_view path, bool isDirectory, const Ref<URL>& base);
  // Parses URL text, relative to base when one is given; null for text that
  // cannot stand in a URL (spaces, controls, non-ASCII, bad escapes).
  static Ref<URL> withString(std::string_view text, const Ref<URL>& base = nullptr);

  const std::string& relativeString() const noexcept { return relative_; }
  const Ref<URL>& baseURL() const noexcept { return base_; }
  const std::string& absoluteString() const noexcept { return absolute_; }
  // The URL of the absolute string, with no base (this one when it has none).
  Ref<URL> absoluteURL() const;
  bool hasDirectoryPath() const noexcept;
  bool isFileURL() const noexcept;
  // The decoded file-system path of a file URL, without a trailing "/" (but
  // "/" itself); none for other schemes or a path holding NUL.
  std::optional<std::string> fileSystemPath() const;

  TypeKind kind() const noexcept override { return TypeKind::URL; }
  bool isEqual(const Object& other) const noexcept override;
  size_t hash() const noexcept override;
  std::string description() const override { return absolute_; }

 private:
  URL(std::string relative, Ref<URL> base);

  std::string relative_;
  Ref<URL> base_;
  std::string absolute_;
  mutable std::atomic<size_t> hash_{0};  // 0: not yet computed
};

// Escapes every byte that may not stand in a URL path as "%XX" (upper-case hex).
std::string percentEscapePath(std::string_view bytes);
// Decodes "%XX" escapes; none when an escape is malformed.
std::optional<std::string> percentDecode(std::string_view text);

template <>
inline constexpr TypeKind kExactKind<URL> = TypeKind::URL;

}  // namespace qr
