#include "ManagerFixture.h"

namespace kelvo {
namespace {

class ManagerClientTest : public test::ManagerFixture {
  protected:
    ManagerClientTest() { createManager(); }

    void serve(std::int32_t processIdentifier, Dictionary entitlements = {}) {
        connection = std::make_shared<SimulatedConnection>(processIdentifier, std::move(entitlements));
        device.ipc->setCurrentConnection(connection);
    }
    void addApplication(std::int32_t processIdentifier, const std::string& bundleID) {
        SimulatedBundleContent content;
        content.bundleIdentifier = bundleID;
        device.bundles->addBundle("/Applications/" + bundleID, content);
        device.bundles->addProcess(processIdentifier, "/Applications/" + bundleID + "/program");
    }

    std::shared_ptr<SimulatedConnection> connection;
};

TEST_F(ManagerClientTest, EntitlementIsTheValuesBoolean) {
    serve(10, {{"com.quillon.private.kelvo-kit", true}});
    EXPECT_TRUE(manager->clientHasSystemEntitlements());
    serve(10, {{"com.quillon.private.kelvo-kit", false}});
    EXPECT_FALSE(manager->clientHasSystemEntitlements());
}

TEST_F(ManagerClientTest, AbsentEntitlementCountsAsNo) {
    serve(10, {{"com.quillon.private.kelvo-kit.can-setup-broadcast", true}});
    EXPECT_FALSE(manager->clientHasSystemEntitlements());
}

TEST_F(ManagerClientTest, EntitlementThatIsNoBooleanCountsAsNo) {
    for (const Value& value : {Value("yes"), Value("true"), Value(1), Value(0.5), Value(Array{true})}) {
        serve(10, {{"com.quillon.private.kelvo-kit", value}});
        EXPECT_FALSE(manager->clientHasSystemEntitlements()) << value.description();
    }
}

TEST_F(ManagerClientTest, WithoutARequestNobodyIsEntitled) {
    EXPECT_FALSE(manager->clientHasSystemEntitlements());
}

TEST_F(ManagerClientTest, CallerIsTheBundleOfItsProcess) {
    addApplication(10, "com.example.app");
    serve(10);
    EXPECT_EQ(manager->getCallingConnectionBundleID(), "com.example.app");
}

TEST_F(ManagerClientTest, CallerWithoutABundleHasNoIdentifierAndNoSession) {
    serve(11);
    EXPECT_EQ(manager->getCallingConnectionBundleID(), std::nullopt);
    EXPECT_EQ(manager->getCallingConnectionRecordingSession(), nullptr);
}

TEST_F(ManagerClientTest, CallersSessionIsTheOneOfItsBundle) {
    addApplication(10, "com.example.app");
    serve(10);
    EXPECT_EQ(manager->getCallingConnectionRecordingSession(), nullptr) << "asking creates none";
    const auto created = session("com.example.app");
    EXPECT_EQ(manager->getCallingConnectionRecordingSession(), created);
}

TEST_F(ManagerClientTest, RememberedConnectionServesOutsideARequest) {
    addApplication(10, "com.example.app");
    const auto remembered = std::make_shared<SimulatedConnection>(10, Dictionary());
    manager->connectionManager()->setCurrentConnection(remembered);
    EXPECT_EQ(manager->getCallingConnectionBundleID(), "com.example.app");
}

TEST_F(ManagerClientTest, RememberedConnectionThatWentAwayReadsAsNone) {
    manager->connectionManager()->setCurrentConnection(
        std::make_shared<SimulatedConnection>(10, Dictionary()));
    EXPECT_EQ(manager->connectionManager()->getCurrentConnection(), nullptr);
}

}  // namespace
}  // namespace kelvo
