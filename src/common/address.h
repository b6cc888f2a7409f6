#pragma once

// Remote hosts are written differently in commands by their kind; a link-local peer also needs the local
// interface that leads to it.

#include <string>
#include <string_view>

namespace bakjob
{

enum AddressKind : int {
    ADDRESS_IPV4 = 1,      // or a host name
    ADDRESS_IPV6 = 2,      //
    ADDRESS_LINK_LOCAL = 3 // IPv6, fe80::/10
};

AddressKind ip_address_kind(std::string_view address);

// A percent sign and the local interface of link-local peers, for example "%egiga0"; chosen from the network
// settings at the first call and the same for the rest of the process.
const char *link_local_scope();

// The address, with its scope when it is link-local.
std::string scoped_host(const std::string &address);

// The same in square brackets unless it is of kind ADDRESS_IPV4: the form that rsync takes.
std::string bracketed_host(const std::string &address);

// What stands in front of a remote path: "USER@HOST::" for a daemon, "USER@HOST:" over ssh; without `user`
// (null), the host and its colons.
enum class Reached { BY_DAEMON, OVER_SSH };
std::string rsync_address(const char *user, const std::string &host, Reached how);

// The flag that IPv6 hosts need behind other rsync flags: "6" or nothing.
const char *ipv6_flag(std::string_view address);

} // namespace bakjob
