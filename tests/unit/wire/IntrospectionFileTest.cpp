#include "GoldenFile.h"
#include "ipc/KVAlertProtocols.h"
#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVDaemonProtocol.h"
#include "platform/linux/ipc/Introspection.h"
#include "platform/linux/ipc/Signature.h"

#include <algorithm>
#include <set>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

const std::vector<std::shared_ptr<const IPCInterface>> kInterfaces{
    interfaceOf<KVDaemonProtocol>(), interfaceOf<KVClientProtocol>(), interfaceOf<KVAlertServiceProtocol>(),
    interfaceOf<KVAlertShellProtocol>()};

/// A method's arguments and, behind them, its reply's values.
std::vector<IPCArgument> valuesOf(const IPCMethod& method) {
    std::vector<IPCArgument> values = method.arguments;
    if (method.reply) values.insert(values.end(), method.reply->begin(), method.reply->end());
    return values;
}

TEST(IntrospectionFileTest, FilesAreCurrent) {
    for (const auto& interface : kInterfaces) {
        test::expectGolden(std::filesystem::path(KELVO_RESOURCES) / "dbus" / (interface->name + ".xml"),
                           dbus::interfaceFile(*interface));
    }
}

TEST(IntrospectionFileTest, NoOtherFilesLieThere) {
    std::size_t count = 0;
    for ([[maybe_unused]] const auto& entry :
         std::filesystem::directory_iterator(std::filesystem::path(KELVO_RESOURCES) / "dbus"))
        ++count;
    EXPECT_EQ(count, kInterfaces.size());
}

TEST(IntrospectionFileTest, ProtocolsAreComplete) {
    EXPECT_EQ(kInterfaces[0]->methods.size(), 19U);
    EXPECT_EQ(kInterfaces[1]->methods.size(), 10U);
}

TEST(IntrospectionFileTest, EveryMessageAndEachOfItsValuesIsDocumented) {
    for (const auto& interface : kInterfaces) {
        for (const IPCMethod& method : interface->methods) {
            EXPECT_FALSE(method.documentation.empty()) << method.name;
            for (const IPCArgument& value : valuesOf(method))
                EXPECT_FALSE(value.documentation.empty()) << method.name << " " << value.name;
        }
    }
}

TEST(IntrospectionFileTest, EveryValueHasANameOfItsOwnAndATypeWhereTheTypeIsKnown) {
    for (const auto& interface : kInterfaces) {
        for (const IPCMethod& method : interface->methods) {
            std::set<std::string> names;
            for (const IPCArgument& value : method.arguments)
                EXPECT_TRUE(names.insert(value.name).second) << method.name << " " << value.name;
            for (const IPCArgument& value : valuesOf(method)) {
                EXPECT_TRUE(dbus::isSingleType(value.signature)) << method.name << " " << value.name;
                EXPECT_NE(value.signature, "v") << method.name << " " << value.name;
            }
        }
    }
}

TEST(IntrospectionFileTest, OnlyTheEndpointAndTheFrameCarryObjects) {
    std::set<std::string> carriers;
    for (const auto& interface : kInterfaces) {
        for (const IPCMethod& method : interface->methods) {
            for (std::size_t i = 0; i < method.arguments.size(); ++i) {
                if (method.arguments[i].allowedObjects != IPCObjects::none)
                    carriers.insert(method.name + " " + std::to_string(i));
            }
            for (const IPCArgument& value : method.reply.value_or(std::vector<IPCArgument>()))
                EXPECT_EQ(value.allowedObjects, IPCObjects::none) << method.name << " " << value.name;
        }
    }
    EXPECT_EQ(carriers,
              (std::set<std::string>{"startRecordingWindowLayerContextIDs 7", "captureHandlerWithSample 0"}));
}

TEST(IntrospectionTest, TextIsEscaped) {
    const IPCInterface interface {
        "a.b", {
            { "m", {{"x", "s", IPCObjects::none, "a \"b\" & <c>"}}, {}, "one & two" }
        }
    };
    const std::string text = dbus::interfaceXML(interface);
    EXPECT_NE(text.find("value=\"a &quot;b&quot; &amp; &lt;c>\""), std::string::npos) << text;
    EXPECT_NE(text.find("value=\"one &amp; two\""), std::string::npos) << text;
}

}  // namespace
}  // namespace kelvo
