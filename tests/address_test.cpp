#include "common/address.h"
#include "support.h"

using namespace bakjob;

TEST(Address, KindsDecideHowAHostIsWritten)
{
    for (const char *name : {"10.0.0.1", "nas.example", "nas", "::ffff:10.1.1.1", ""})
        EXPECT_EQ(ip_address_kind(name), ADDRESS_IPV4) << name;
    for (const char *name : {"fe80::1", "FE80::1", "febf::1", "feA0::1"})
        EXPECT_EQ(ip_address_kind(name), ADDRESS_LINK_LOCAL) << name;
    for (const char *name : {"fec0::1", "2001:db8::1", "::1", "f:"})
        EXPECT_EQ(ip_address_kind(name), ADDRESS_IPV6) << name;
}

using LinkLocal = Appliance;

TEST_F(LinkLocal, TheScopeFollowsTheNetworkSettingsOfTheFirstCall)
{
    struct Case {
        Keys settings;
        std::string scope;
    };
    const std::vector<Case> cases = {
        {{}, "%egiga0"},
        {{{"default_gw", "lan0"}}, "%egiga0"},
        {{{"default_gw", "lan1"}}, "%egiga1"},
        {{{"default_gw", "other"}, {"lan0/vlan_enable", "1"}, {"lan0/vlan_id", "9"}}, "%egiga0"},
        {{{"default_gw", "lan0"}, {"lan0/vlan_enable", "1"}, {"lan0/vlan_id", "9"}}, "%egiga0.9"},
        {{{"default_gw", "lan1"}, {"lan1/vlan_enable", "1"}, {"lan1/vlan_id", "7"}}, "%egiga1.7"},
        {{{"default_gw", "lan1"}, {"lan1/vlan_enable", "0"}, {"lan0/vlan_enable", "1"}}, "%egiga1"},
        {{{"bonding/enable", "1"}, {"default_gw", "lan1"}}, "%bond0"},
        {{{"bonding/enable", "1"}, {"lan0/vlan_enable", "1"}, {"lan0/vlan_id", "12"}}, "%bond0.12"},
    };
    for (const Case &one : cases) {
        EXPECT_EQ(in_child([&] {
                      for (const auto &[key, value] : one.settings)
                          store_set("/network_mgr/" + key, value);
                      const std::string first = link_local_scope();
                      store_set("/network_mgr/bonding/enable", "1");
                      return first == one.scope && link_local_scope() == first ? 0 : 1;
                  }),
                  0)
            << one.scope;
    }
}
