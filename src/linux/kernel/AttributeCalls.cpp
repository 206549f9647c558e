#include "linux/kernel/AttributeCalls.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <fcntl.h>
#include <linux/limits.h>
#include <sys/syscall.h>
#include <sys/xattr.h>
#include <unistd.h>

namespace mirabel {
namespace {

// Calls relative to a folder came with kernel 6.13; the numbers are the same on all machines.
constexpr long numberOfGetxattrat = 464;
constexpr long numberOfListxattrat = 465;
struct AttributeArguments {
  alignas(8) std::uint64_t value;
  std::uint32_t size;
  std::uint32_t flags;
};

bool kernelHas(long number) {
  // A descriptor that is none: EBADF from a kernel that knows the call, ENOSYS from one that does
  // not, EPERM from a sandbox that does not.
  return ::syscall(number, -1, "x", 0, "x", nullptr, sizeof(AttributeArguments)) != 0 &&
         errno != ENOSYS && errno != EPERM;
}

bool hasRelativeCalls() {
  static const bool result = kernelHas(numberOfListxattrat) && kernelHas(numberOfGetxattrat);
  return result;
}

// The way round for older kernels. The magic link leads to the object that the descriptor holds,
// and only `name` is looked up from there.
std::string pathThroughDescriptor(int folder, const std::string& name) {
  std::string path = "/proc/self/fd/" + std::to_string(folder);
  if (!name.empty()) path.append("/").append(name);
  return path;
}

long callList(int folder, const std::string& name, char* buffer, std::size_t size) {
  if (name.empty()) return ::listxattr(pathThroughDescriptor(folder, name).c_str(), buffer, size);
  if (!hasRelativeCalls()) {
    return ::llistxattr(pathThroughDescriptor(folder, name).c_str(), buffer, size);
  }
  return ::syscall(numberOfListxattrat, folder, name.c_str(), AT_SYMLINK_NOFOLLOW, buffer, size);
}

long callGet(int folder, const std::string& name, const std::string& attribute, void* buffer,
             std::size_t size) {
  if (name.empty()) {
    const std::string path = pathThroughDescriptor(folder, name);
    return ::getxattr(path.c_str(), attribute.c_str(), buffer, size);
  }
  if (!hasRelativeCalls()) {
    const std::string path = pathThroughDescriptor(folder, name);
    return ::lgetxattr(path.c_str(), attribute.c_str(), buffer, size);
  }
  AttributeArguments arguments{reinterpret_cast<std::uintptr_t>(buffer),
                               static_cast<std::uint32_t>(size), 0};
  return ::syscall(numberOfGetxattrat, folder, name.c_str(), AT_SYMLINK_NOFOLLOW, attribute.c_str(),
                   &arguments, sizeof(arguments));
}

Error readError(int errnoValue) {
  return Error::posix(errnoValue == ENOTSUP ? ENODATA : errnoValue);
}

}  // namespace

Result<std::string_view> listAttributes(int folder, const std::string& name,
                                        std::vector<char>& buffer) {
  if (buffer.empty()) buffer.resize(1024);
  while (true) {
    const long length = callList(folder, name, buffer.data(), buffer.size());
    if (length >= 0) return std::string_view(buffer.data(), static_cast<std::size_t>(length));
    if (errno == ENOTSUP) return std::string_view();
    if (errno != ERANGE || buffer.size() >= XATTR_LIST_MAX) return fail(Error::posix(errno));
    buffer.resize(XATTR_LIST_MAX);
  }
}

Result<std::size_t> attributeSize(int folder, const std::string& name,
                                  const std::string& attribute) {
  const long length = callGet(folder, name, attribute, nullptr, 0);
  if (length < 0) return fail(readError(errno));
  return static_cast<std::size_t>(length);
}

Result<Data> readAttribute(int folder, const std::string& name, const std::string& attribute,
                           std::size_t size) {
  // The kernel takes a size of 0 as the question how long the value is, so an empty value is read
  // with room for a byte. It refuses room for more than a value can have.
  Data value(std::min<std::size_t>(std::max<std::size_t>(size, 1), XATTR_SIZE_MAX));
  const long length = callGet(folder, name, attribute, value.data(), value.size());
  if (length < 0) return fail(readError(errno));
  if (static_cast<std::size_t>(length) > size) return fail(Error::posix(ERANGE));
  value.resize(static_cast<std::size_t>(length));
  return value;
}

std::vector<std::string> userAttributeNames(std::string_view list) {
  std::vector<std::string> names;
  while (!list.empty()) {
    const std::string_view name = list.substr(0, list.find('\0'));
    if (name.starts_with(userAttributePrefix)) {
      names.emplace_back(name.substr(userAttributePrefix.size()));
    }
    list.remove_prefix(std::min(list.size(), name.size() + 1));
  }
  return names;
}

}  // namespace mirabel
