#include "platform/linux/ipc/Introspection.h"

namespace kelvo::dbus {
namespace {

constexpr const char* kDocumentType =
    "<!DOCTYPE node PUBLIC \"-//freedesktop//DTD D-BUS Object Introspection 1.0//EN\"\n"
    " \"http://www.freedesktop.org/standards/dbus/1.0/introspect.dtd\">\n";

constexpr const char* kStandardInterfaces =
    "  <interface name=\"org.freedesktop.DBus.Introspectable\">\n"
    "    <method name=\"Introspect\">\n"
    "      <arg name=\"xml\" type=\"s\" direction=\"out\"/>\n"
    "    </method>\n"
    "  </interface>\n"
    "  <interface name=\"org.freedesktop.DBus.Peer\">\n"
    "    <method name=\"Ping\"/>\n"
    "  </interface>\n";

/// Text as it may stand in an attribute.
std::string escaped(const std::string& text) {
    std::string result;
    for (const char character : text) {
        switch (character) {
            case '&':
                result += "&amp;";
                break;
            case '<':
                result += "&lt;";
                break;
            case '"':
                result += "&quot;";
                break;
            default:
                result += character;
        }
    }
    return result;
}

/// What tools know as an element's documentation; nothing without one.
std::string documentationXML(const std::string& documentation, const char* indentation) {
    if (documentation.empty()) return {};
    return std::string(indentation) + "<annotation name=\"org.gtk.GDBus.DocString\" value=\"" +
           escaped(documentation) + "\"/>\n";
}

std::string argumentXML(const IPCArgument& argument, const char* direction) {
    const std::string head = "      <arg name=\"" + argument.name + "\" type=\"" + argument.signature +
                             "\" direction=\"" + direction + "\"";
    const std::string content = documentationXML(argument.documentation, "        ");
    return content.empty() ? head + "/>\n" : head + ">\n" + content + "      </arg>\n";
}

std::string methodXML(const IPCMethod& method) {
    std::string content = documentationXML(method.documentation, "      ");
    for (const IPCArgument& argument : method.arguments)
        content += argumentXML(argument, "in");
    if (method.isOneWay()) {
        content += "      <annotation name=\"org.freedesktop.DBus.Method.NoReply\" value=\"true\"/>\n";
    } else {
        for (const IPCArgument& value : *method.reply)
            content += argumentXML(value, "out");
    }
    const std::string head = "    <method name=\"" + method.name + "\"";
    return content.empty() ? head + "/>\n" : head + ">\n" + content + "    </method>\n";
}

}  // namespace

std::string interfaceXML(const IPCInterface& interface) {
    std::string text = "  <interface name=\"" + interface.name + "\">\n";
    for (const IPCMethod& method : interface.methods)
        text += methodXML(method);
    return text + "  </interface>\n";
}

std::string interfaceFile(const IPCInterface& interface) {
    return kDocumentType +
           std::string("<!-- Made from the protocol's table; see docs/wire.md. -->\n<node name=\"") +
           kObjectPath + "\">\n" + interfaceXML(interface) + "</node>\n";
}

std::string objectXML(const IPCInterface& interface) {
    return kDocumentType + std::string("<node>\n") + kStandardInterfaces + interfaceXML(interface) +
           "</node>\n";
}

std::string parentXML(const std::string& child) {
    return kDocumentType + std::string("<node>\n  <node name=\"") + child + "\"/>\n</node>\n";
}

}  // namespace kelvo::dbus
