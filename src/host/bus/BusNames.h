#pragma once

namespace mirabel::bus {

// The service on the session bus. What its methods take and give is in
// packaging/dbus/com.norvane.Vessel1.xml.

inline constexpr const char* serviceName = "com.norvane.Vessel1";
inline constexpr const char* objectPath = "/com/norvane/Vessel1";
/// Looks up, lists, and enumerates changes.
inline constexpr const char* providerInterface = "com.norvane.Vessel1.Provider";
/// Changes items.
inline constexpr const char* operationsInterface = "com.norvane.Vessel1.Operations";
/// Status and maintenance; not for sandboxed callers.
inline constexpr const char* managerInterface = "com.norvane.Vessel1.Manager";

}  // namespace mirabel::bus
