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

/// The bus itself, which is an object on it too.
inline constexpr const char* daemonName = "org.freedesktop.DBus";
inline constexpr const char* daemonPath = "/org/freedesktop/DBus";
/// Matches what it says when a name gets another owner, or none: arguments name, before, now.
inline constexpr const char* ownerChanges =
    "type='signal',sender='org.freedesktop.DBus',path='/org/freedesktop/DBus',"
    "interface='org.freedesktop.DBus',member='NameOwnerChanged'";

}  // namespace mirabel::bus
