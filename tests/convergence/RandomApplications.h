#pragma once

#include <string>
#include <vector>

#include "convergence/RandomTree.h"

namespace mirabel::testing {

/// Random changes to the applications that are installed in a home, to their containers, and to the
/// files in which their list is kept, as other programs make them.
class RandomApplications {
 public:
  explicit RandomApplications(std::string home);

  /// The document folders that the applications have or could have.
  [[nodiscard]] std::vector<std::string> libraries() const;
  /// Whether the application whose folder that is is installed.
  [[nodiscard]] bool isInstalled(const std::string& library) const;
  /// Makes one, and answers what it was, for people.
  std::string change(RandomTree& random);
  /// What may become of the files of the list while nobody has them in use.
  std::string damage(RandomTree& random);

 private:
  [[nodiscard]] std::string entryOf(const std::string& application) const;
  [[nodiscard]] std::string containerOf(const std::string& application) const;
  void install(const std::string& application, const std::string& name) const;

  std::string home_;
};

}  // namespace mirabel::testing
