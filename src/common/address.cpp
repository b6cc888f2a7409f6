#include "common/address.h"

#include "common/text.h"
#include "platform/config_store.h"

#include <cstdio>
#include <cstring>
#include <strings.h>

namespace bakjob
{

namespace
{

char scope[64];

void set_scope(const char *interface, const char *port)
{
    const std::string settings = format_text("/network_mgr/%s/", port);
    if (xml_get_int((settings + "vlan_enable").c_str()) == 1) {
        std::snprintf(scope, sizeof scope, "%s.%d", interface, xml_get_int((settings + "vlan_id").c_str()));
    } else {
        copy_text(scope, interface);
    }
}

} // namespace

AddressKind ip_address_kind(std::string_view address)
{
    if (contains(address, ".") || !contains(address, ":")) return ADDRESS_IPV4;
    for (const char *prefix : {"fe8", "fe9", "fea", "feb"}) {
        if (address.size() >= 3 && strncasecmp(address.data(), prefix, 3) == 0) return ADDRESS_LINK_LOCAL;
    }
    return ADDRESS_IPV6;
}

const char *link_local_scope()
{
    if (scope[0] != '\0') return scope;
    copy_text(scope, "%egiga0");
    if (xml_get_int("/network_mgr/bonding/enable") == 1) {
        set_scope("%bond0", "lan0");
        return scope;
    }
    char gateway[64] = "";
    xml_get_str("/network_mgr/default_gw", sizeof gateway, gateway);
    if (std::strcmp(gateway, "lan0") == 0) set_scope("%egiga0", "lan0");
    if (std::strcmp(gateway, "lan1") == 0) set_scope("%egiga1", "lan1");
    return scope;
}

std::string scoped_host(const std::string &address)
{
    return ip_address_kind(address) == ADDRESS_LINK_LOCAL ? address + link_local_scope() : address;
}

std::string bracketed_host(const std::string &address)
{
    return ip_address_kind(address) == ADDRESS_IPV4 ? address : '[' + scoped_host(address) + ']';
}

std::string rsync_address(const char *user, const std::string &host, Reached how)
{
    const std::string login = user == nullptr ? "" : std::string(user) + '@';
    return login + bracketed_host(host) + (how == Reached::BY_DAEMON ? "::" : ":");
}

const char *ipv6_flag(std::string_view address)
{
    return ip_address_kind(address) == ADDRESS_IPV4 ? "" : "6";
}

} // namespace bakjob
