#pragma once

/// Marks what the shared library lets others call. Everything else stays inside it.
#define MIRABEL_EXPORT __attribute__((visibility("default")))
