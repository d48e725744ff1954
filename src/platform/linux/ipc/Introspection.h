#pragma once

#include "platform/IPCInterface.h"

#include <string>

namespace kelvo::dbus {

/// The one object that either side of a connection has.
inline constexpr const char* kObjectPath = "/com/quillon/kelvod";

/// Of the server's object: how a client that is sent frames asks for a shorter way for them.
inline constexpr const char* kLaneInterface = "com.quillon.kelvod.FrameLane";

/// The D-Bus description of one interface, as it stands in an introspection file.
std::string interfaceXML(const IPCInterface& interface);

/// An introspection file of its own: of the object, where it serves `interface`.
std::string interfaceFile(const IPCInterface& interface);

/// The answer to `Introspect` on an object that serves `interface` and the standard ones.
std::string objectXML(const IPCInterface& interface);
/// The same on an object above ours: the names of its children.
std::string parentXML(const std::string& child);

}  // namespace kelvo::dbus
