#include "runtime/SourceTable.h"

#include <algorithm>
#include <tuple>

namespace qivo::runtime {

template <typename T>
void SourceTable::add(Records<T>& records, int interface, const T& value) {
    const auto same = [&](const Heard<T>& heard) { return heard.interface == interface && heard.value == value; };
    const auto found = std::find_if(records.begin(), records.end(), same);
    if (found != records.end()) {
        ++found->count;
    } else if (records.size() < kMaxRecords) {
        records.push_back({interface, value, 1, ++m_arrivals});
    }
}

template <typename T>
void SourceTable::remove(Records<T>& records, int interface, const T& value) {
    const auto same = [&](const Heard<T>& heard) { return heard.interface == interface && heard.value == value; };
    const auto found = std::find_if(records.begin(), records.end(), same);
    if (found != records.end() && --found->count == 0) {
        records.erase(found);
    }
}

template <typename T>
const SourceTable::Heard<T>* SourceTable::newest(const Records<T>& records, int interface) {
    const Heard<T>* best = nullptr;
    for (const Heard<T>& heard : records) {
        if (heard.interface == interface && (best == nullptr || heard.arrival > best->arrival)) {
            best = &heard;
        }
    }
    return best;
}

bool SourceTable::addService(int interface, const std::string& name) {
    const std::string key = foldCase(name);
    if (m_services.size() >= kMaxSources && m_services.find(key) == m_services.end()) {
        return false;
    }
    Service& service = m_services[key];
    if (service.name.empty()) {
        service.name = name;
    }
    add(service.pointers, interface, {});
    return true;
}

void SourceTable::removeService(int interface, const std::string& name) {
    const auto found = m_services.find(foldCase(name));
    if (found == m_services.end()) {
        return;
    }
    remove(found->second.pointers, interface, {});
    if (found->second.pointers.empty()) {
        m_services.erase(found);
    }
}

bool SourceTable::hasService(const std::string& key) const {
    return m_services.find(key) != m_services.end();
}

void SourceTable::addServer(int interface, const std::string& key, const ServiceServer& server) {
    if (const auto found = m_services.find(key); found != m_services.end()) {
        add(found->second.servers, interface, server);
    }
}

void SourceTable::removeServer(int interface, const std::string& key, const ServiceServer& server) {
    if (const auto found = m_services.find(key); found != m_services.end()) {
        remove(found->second.servers, interface, server);
    }
}

void SourceTable::addText(int interface, const std::string& key, const ServiceText& text) {
    if (const auto found = m_services.find(key); found != m_services.end()) {
        add(found->second.texts, interface, text);
    }
}

void SourceTable::removeText(int interface, const std::string& key, const ServiceText& text) {
    if (const auto found = m_services.find(key); found != m_services.end()) {
        remove(found->second.texts, interface, text);
    }
}

std::vector<std::string> SourceTable::hostsOf(const std::string& key) const {
    std::vector<std::string> hosts;
    if (const auto found = m_services.find(key); found != m_services.end()) {
        for (const auto& heard : found->second.servers) {
            hosts.push_back(heard.value.host);
        }
    }
    std::sort(hosts.begin(), hosts.end());
    hosts.erase(std::unique(hosts.begin(), hosts.end()), hosts.end());
    return hosts;
}

void SourceTable::addAddress(int interface, const std::string& host, const IpAddress& address) {
    add(m_hosts[host], interface, address);
}

void SourceTable::removeAddress(int interface, const std::string& host, const IpAddress& address) {
    const auto found = m_hosts.find(host);
    if (found == m_hosts.end()) {
        return;
    }
    remove(found->second, interface, address);
    if (found->second.empty()) {
        m_hosts.erase(found);
    }
}

void SourceTable::forgetHost(const std::string& host) {
    m_hosts.erase(host);
}

void SourceTable::clear() {
    m_services.clear();
    m_hosts.clear();
}

std::optional<int> SourceTable::rank(int interface, const IpAddress& address, const LocalNetwork& network) {
    const auto* heardOn = network.find(interface);
    if (heardOn == nullptr || !address.isUnicast() || network.isBroadcast(interface, address)) {
        return std::nullopt;
    }
    if (address.isLoopback()) {
        // Only this machine speaks on its loopback interface; from elsewhere the address would lead to ourselves.
        return heardOn->loopback ? std::optional(address.version == 4 ? 8 : 9) : std::nullopt;
    }
    const int kind = (address.version == 4 ? 0 : 2) + (address.isLinkLocal() ? 1 : 0);
    return 2 * kind + (network.isOnLink(interface, address) ? 0 : 1);
}

std::optional<SourceTable::Choice> SourceTable::chooseOn(int interface, const Service& service,
                                                         const LocalNetwork& network) const {
    const auto* text = newest(service.texts, interface);
    std::optional<Choice> best;
    for (const auto& server : service.servers) {
        const auto host = m_hosts.find(server.value.host);
        if (text == nullptr || server.interface != interface || server.value.port == 0 || host == m_hosts.end()) {
            continue;
        }
        for (const auto& address : host->second) {
            const auto kind = rank(interface, address.value, network);
            if (address.interface != interface || !kind) {
                continue;
            }
            const Choice choice{interface,         address.value,  *kind,           server.value.priority,
                                server.value.port, server.arrival, address.arrival, &text->value};
            const auto order = [](const Choice& c) {
                return std::tuple(c.priority, c.rank, ~c.serverArrival, ~c.addressArrival);
            };
            if (!best || order(choice) < order(*best)) {
                best = choice;
            }
        }
    }
    return best;
}

std::optional<SourceTable::Choice> SourceTable::choose(const Service& service, const LocalNetwork& network) const {
    std::optional<Choice> best;
    for (const auto& pointer : service.pointers) {
        const auto choice = chooseOn(pointer.interface, service, network);
        const auto order = [&](const Choice& c) {
            return std::tuple(c.priority, c.rank, c.interface != service.lastInterface, c.interface);
        };
        if (choice && (!best || order(*choice) < order(*best))) {
            best = choice;
        }
    }
    return best;
}

Announcement SourceTable::announce(const std::string& name, const Choice& choice, const LocalNetwork& network) {
    const auto* interface = network.find(choice.interface);
    std::string host = choice.address.text();
    if (choice.address.version == 6) {
        const bool zoned = choice.address.isLinkLocal() && interface != nullptr;
        host = "[" + host + (zoned ? "%25" + interface->name : "") + "]";
    }
    const std::string base = "rtsp://" + host + ":" + std::to_string(choice.port);
    Announcement announcement;
    announcement.name = name;
    announcement.url = base + choice.text->path;
    announcement.lowUrl = choice.text->low.empty() ? "" : base + choice.text->low;
    announcement.web = choice.text->web;
    announcement.onvif = choice.text->onvif;
    announcement.local = choice.address.isLoopback() || network.has(choice.address);
    return announcement;
}

std::vector<Announcement> SourceTable::announcements(const LocalNetwork& network) {
    std::vector<Announcement> list;
    for (auto& [key, service] : m_services) {
        if (const auto choice = choose(service, network)) {
            service.lastInterface = choice->interface;
            list.push_back(announce(service.name, *choice, network));
        }
    }
    std::sort(list.begin(), list.end(), [](const Announcement& a, const Announcement& b) { return a.name < b.name; });
    return list;
}

} // namespace qivo::runtime
