#include <gtest/gtest.h>
#include <utility>

#include "foundation/URL.h"

namespace mirabel {
namespace {

constexpr std::string_view nulInside("/a\0b", 4);

TEST(URL, PathsAreNormalized) {
  const std::pair<std::string_view, std::string_view> cases[] = {
      {"/a/b", "/a/b"}, {"//a///b//", "/a/b"},      {"/", "/"},
      {"////", "/"},    {"/a/../b/.", "/a/../b/."}, {"/\xff\n%20", "/\xff\n%20"},
      {"", ""},         {"relative", ""},           {nulInside, ""},
  };
  for (const auto& [given, path] : cases)
    EXPECT_EQ(URL::fileURL(given).path(), path) << given;
}

TEST(URL, ComponentsAreAppendedAndTakenOff) {
  struct Case {
    std::string_view base, component, path, last, parent;
  };
  const Case cases[] = {
      {"/", "a", "/a", "a", "/"},
      {"/a", "b c", "/a/b c", "b c", "/a"},
      {"/a", "b//c/", "/a/b/c", "c", "/a/b"},
      {"/a", "..", "/a/..", "..", "/a"},
      {"/a", "", "/a", "a", "/"},
      {"/", "", "/", "/", "/"},
      {"", "a", "", "", ""},
      {"/a", nulInside.substr(1), "", "", ""},
  };
  for (const auto& [base, component, path, last, parent] : cases) {
    const URL url = URL::fileURL(base).appendingPathComponent(component);
    EXPECT_EQ(url.path(), path);
    EXPECT_EQ(url.lastPathComponent(), last);
    EXPECT_EQ(url.deletingLastPathComponent().path(), parent);
    EXPECT_EQ(url, URL::fileURL(path));
  }
}

TEST(URL, TextAndPathTranslateIntoEachOther) {
  const URL odd = URL::fileURL("/a b/100%/\xC3\xA9-_.~\xff");
  EXPECT_EQ(odd.description(), "file:///a%20b/100%25/%C3%A9-_.~%FF");
  EXPECT_EQ(URL::fromString(odd.description()), odd);

  const std::pair<std::string_view, std::string_view> fileTexts[] = {
      {"file:///a", "/a"},           {"FILE://LocalHost/a/", "/a"},       {"file:/a", "/a"},
      {"file:///a%2fb?q#f", "/a/b"}, {"file:///50%/%zz%4", "/50%/%zz%4"}, {"file:///a%00b", ""},
  };
  for (const auto& [text, path] : fileTexts) {
    EXPECT_TRUE(URL::fromString(text).isFileURL()) << text;
    EXPECT_EQ(URL::fromString(text).path(), path);
  }
  for (const std::string_view text :
       {"https://example.org/a", "file://elsewhere/a", "file:a", ""}) {
    EXPECT_FALSE(URL::fromString(text).isFileURL()) << text;
    EXPECT_EQ(URL::fromString(text).path(), "");
    EXPECT_EQ(URL::fromString(text).description(), text);
  }
}

TEST(URL, ProperURLNamesThePrivateFolder) {
  const std::pair<std::string_view, std::string_view> cases[] = {
      {"/var", "/private/var"},         {"/var/x", "/private/var/x"},
      {"/variety", "/private/variety"}, {"/private/var/x", "/private/var/x"},
      {"/home/var", "/home/var"},       {"/", "/"},
  };
  for (const auto& [path, proper] : cases)
    EXPECT_EQ(URL::fileURL(path).properURL().path(), proper);
  const URL other = URL::fromString("https://example.org/var");
  EXPECT_TRUE(other.properURL().isSameObject(other));
}

TEST(URL, TrashIsADotTrashDirectlyInDocuments) {
  const std::pair<std::string_view, bool> cases[] = {
      {"/a/Documents/.Trash/x", true},  {"/a/Documents/.Trash", true},
      {"/Documents/.Trash", true},      {"/Documents/.Trashes/Documents/.Trash/y/z", true},
      {"/a/.Trash/Documents", false},   {"/a/MyDocuments/.Trash", false},
      {"/a/Documents/.Trashes", false}, {"/a/Documents/b/.Trash", false},
      {"/a/Documents", false},          {"", false},
  };
  for (const auto& [path, expected] : cases)
    EXPECT_EQ(isInTrash(URL::fileURL(path)), expected) << path;
}

TEST(ResourceCache, WhatWasSetOutlivesTheReadAndNothingOutlivesItsEnd) {
  ResourceCache cache;
  cache.set(ResourceKey::documentIdentifier, Number::of(std::uint64_t{9}));
  EXPECT_FALSE(cache.isFilled());
  cache.fill({.fileID = 3});
  cache.setAttributeNames({"a"});
  EXPECT_EQ(cache.snapshot()->documentID, 9u);
  EXPECT_EQ(cache.snapshot()->fileID, 3u);
  cache.clear();
  EXPECT_FALSE(cache.value(ResourceKey::documentIdentifier, "f"));
  EXPECT_FALSE(cache.snapshot());
  EXPECT_FALSE(cache.hasAttribute("a"));
}

}  // namespace
}  // namespace mirabel
