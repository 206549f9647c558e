#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/ApplicationRegistry.h"
#include "platform/IconService.h"

namespace mirabel {

/// In points.
struct ThumbnailSize {
  double width = 0;
  double height = 0;
};

/// Pictures of the app libraries: the icons of their applications. Any thread may call it; it
/// answers on the caller's, before a call returns.
class AppThumbnails {
 public:
  /// Both outlive it.
  AppThumbnails(ApplicationRegistry& applications, IconService& icons)
      : applications_(applications), icons_(icons) {}

  /// Called once for each identifier, in their order: with a PNG file, with the error why there is
  /// none, or with neither for what is no app library.
  using PerThumbnailHandler = std::function<void(
      std::string_view identifier, std::optional<Data> image, std::optional<Error> error)>;
  /// The same with the MIME type of the picture, where there is one.
  using PerTypedThumbnailHandler =
      std::function<void(std::string_view identifier, std::optional<Data> image,
                         std::optional<std::string> type, std::optional<Error> error)>;
  /// Called once, behind all of those, and never with an error.
  using CompletionHandler = std::function<void(std::optional<Error>)>;

  /// A picture fills `requestedSize` in one direction and does not leave it in the other. Errors:
  /// the host's no-such-item error for an application that the registry does not know, and those of
  /// `IconService`.
  void fetchThumbnailsForItemIdentifiers(const std::vector<std::string>& identifiers,
                                         const ThumbnailSize& requestedSize,
                                         const PerThumbnailHandler& perThumbnailCompletionHandler,
                                         const CompletionHandler& completionHandler) const;
  void fetchThumbnailsForItemIdentifiers(
      const std::vector<std::string>& identifiers, const ThumbnailSize& requestedSize,
      const PerTypedThumbnailHandler& perThumbnailCompletionHandlerWithType,
      const CompletionHandler& completionHandler) const;

 private:
  [[nodiscard]] Result<std::optional<Data>> thumbnail(const std::string& identifier,
                                                      const IconVariant& variant) const;

  ApplicationRegistry& applications_;
  IconService& icons_;
};

}  // namespace mirabel
