#include "vrx/host/activities/network_routes.h"

#include <linux/rtnetlink.h>
#include <sys/socket.h>

#include <array>
#include <cerrno>

namespace vrx::host {

namespace {

Descriptor openSocket(std::uint32_t groups, int flags) {
    Descriptor file(socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC | flags, NETLINK_ROUTE));
    sockaddr_nl address{};
    address.nl_family = AF_NETLINK;
    address.nl_groups = groups;
    if (file && bind(file.number(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0)
        return Descriptor();
    return file;
}

bool requestRoutes(int file) {
    struct {
        nlmsghdr header;
        rtmsg route;
    } request{};
    request.header.nlmsg_len = sizeof request;
    request.header.nlmsg_type = RTM_GETROUTE;
    request.header.nlmsg_flags = NLM_F_REQUEST | NLM_F_DUMP;
    return send(file, &request, sizeof request, 0) == static_cast<ssize_t>(sizeof request);
}

// Ignores routes that lead nowhere and those whose link is down, which a machine without a network may have.
bool leadsEverywhere(const rtmsg& route) {
    return route.rtm_dst_len == 0 && route.rtm_src_len == 0 && route.rtm_type == RTN_UNICAST &&
           route.rtm_table != RT_TABLE_LOCAL && (route.rtm_flags & (RTNH_F_DEAD | RTNH_F_LINKDOWN)) == 0;
}

enum class Part { Nothing, DefaultRoute, End, Failure };

// Reads one datagram of the answer.
Part readPart(const void* bytes, std::size_t size) {
    const auto* message = static_cast<const nlmsghdr*>(bytes);
    for (; NLMSG_OK(message, size); message = NLMSG_NEXT(message, size)) {
        if (message->nlmsg_type == NLMSG_DONE) return Part::End;
        if (message->nlmsg_type == NLMSG_ERROR) return Part::Failure;
        if (message->nlmsg_type == RTM_NEWROUTE && leadsEverywhere(*static_cast<const rtmsg*>(NLMSG_DATA(message))))
            return Part::DefaultRoute;
    }
    return Part::Nothing;
}

}  // namespace

bool NetworkRoutes::hasDefaultRoute() const {
    const Descriptor file = openSocket(0, 0);
    if (!file || !requestRoutes(file.number())) return true;
    alignas(nlmsghdr) std::array<char, 32768> buffer;
    while (true) {
        const ssize_t size = recv(file.number(), buffer.data(), buffer.size(), 0);
        if (size < 0 && errno == EINTR) continue;
        const Part part = size > 0 ? readPart(buffer.data(), static_cast<std::size_t>(size)) : Part::Failure;
        if (part != Part::Nothing) return part != Part::End;
    }
}

// Listens for links, too: when a link goes down, the kernel does not report each route that goes with it.
void NetworkRoutes::setReporting(bool isReporting) {
    if (isReporting == static_cast<bool>(events_)) return;
    source_.reset();
    events_ = Descriptor();
    if (!isReporting) return;
    events_ = openSocket(RTMGRP_LINK | RTMGRP_IPV4_ROUTE | RTMGRP_IPV6_ROUTE, SOCK_NONBLOCK);
    if (events_) source_ = addReadSource(loop_, events_.number(), onEvents, this);
}

// Drains the socket, also when it has overflowed (ENOBUFS). What changed is asked afresh.
int NetworkRoutes::onEvents(sd_event_source*, int file, std::uint32_t, void* self) {
    std::array<char, 8192> events;
    while (recv(file, events.data(), events.size(), MSG_TRUNC) > 0 || errno == ENOBUFS) {
    }
    static_cast<NetworkRoutes*>(self)->onChange_();
    return 0;
}

}  // namespace vrx::host
