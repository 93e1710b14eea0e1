#include "tests/tools/Browser.h"

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <avahi-common/malloc.h>
#include <avahi-common/thread-watch.h>
#include <avahi-core/core.h>
#include <avahi-core/log.h>
#include <avahi-core/lookup.h>
#include <avahi-core/publish.h>
#include <avahi-core/rr.h>
#include <functional>
#include <thread>

namespace qivo::test {
namespace {

constexpr const char* type = "_rtsp._tcp";

bool waitUntil(std::chrono::milliseconds deadline, const std::function<bool()>& condition) {
    const auto end = std::chrono::steady_clock::now() + deadline;
    while (!condition()) {
        if (std::chrono::steady_clock::now() > end) {
            return false;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
    return true;
}

} // namespace

struct Browser::Callbacks {
    static void onBrowse(AvahiSServiceBrowser* browser, AvahiIfIndex interface, AvahiProtocol protocol,
                         AvahiBrowserEvent event, const char* name, const char* serviceType, const char* domain,
                         AvahiLookupResultFlags, void* data) {
        auto& self = *static_cast<Browser*>(data);
        if (event == AVAHI_BROWSER_NEW) {
            avahi_s_service_resolver_new(self.m_server, interface, protocol, name, serviceType, domain,
                                         AVAHI_PROTO_INET, static_cast<AvahiLookupFlags>(0), onResolved, data);
        } else if (event == AVAHI_BROWSER_REMOVE) {
            const std::lock_guard lock(self.m_mutex);
            self.m_found.erase(name);
        }
        static_cast<void>(browser);
    }

    static void onResolved(AvahiSServiceResolver* resolver, AvahiIfIndex, AvahiProtocol, AvahiResolverEvent event,
                           const char* name, const char*, const char*, const char* host, const AvahiAddress* address,
                           std::uint16_t port, AvahiStringList* text, AvahiLookupResultFlags, void* data) {
        auto& self = *static_cast<Browser*>(data);
        if (event == AVAHI_RESOLVER_FOUND) {
            Found found;
            std::array<char, AVAHI_ADDRESS_STR_MAX> shown{};
            found.address = avahi_address_snprint(shown.data(), shown.size(), address);
            found.host = host;
            found.port = port;
            for (AvahiStringList* entry = text; entry != nullptr; entry = avahi_string_list_get_next(entry)) {
                char* key = nullptr;
                char* value = nullptr;
                avahi_string_list_get_pair(entry, &key, &value, nullptr);
                found.text[key] = value != nullptr ? value : "";
                avahi_free(key);
                avahi_free(value);
            }
            const std::lock_guard lock(self.m_mutex);
            self.m_found[name] = found;
        }
        avahi_s_service_resolver_free(resolver);
    }
};

Browser::Browser() {
    avahi_set_log_function([](AvahiLogLevel, const char*) {});
    m_poll = avahi_threaded_poll_new();
    AvahiServerConfig config;
    avahi_server_config_init(&config);
    avahi_free(config.host_name);
    config.host_name = avahi_strdup("watching-host");
    config.use_ipv6 = 0;
    m_server = avahi_server_new(
        avahi_threaded_poll_get(m_poll), &config, [](AvahiServer*, AvahiServerState, void*) {}, nullptr, nullptr);
    avahi_server_config_free(&config);
    avahi_s_service_browser_new(m_server, AVAHI_IF_UNSPEC, AVAHI_PROTO_INET, type, nullptr,
                                static_cast<AvahiLookupFlags>(0), Callbacks::onBrowse, this);
    avahi_threaded_poll_start(m_poll);
}

Browser::~Browser() {
    avahi_threaded_poll_stop(m_poll);
    avahi_server_free(m_server);
    avahi_threaded_poll_free(m_poll);
}

void Browser::announce(const std::string& name, int port) {
    avahi_threaded_poll_lock(m_poll);
    AvahiSEntryGroup* group = avahi_s_entry_group_new(
        m_server, [](AvahiServer*, AvahiSEntryGroup*, AvahiEntryGroupState, void*) {}, nullptr);
    const int result = avahi_server_add_service_strlst(m_server, group, AVAHI_IF_UNSPEC, AVAHI_PROTO_UNSPEC,
                                                       static_cast<AvahiPublishFlags>(0), name.c_str(), type, nullptr,
                                                       nullptr, static_cast<std::uint16_t>(port), nullptr);
    EXPECT_EQ(result, 0);
    avahi_s_entry_group_commit(group);
    avahi_threaded_poll_unlock(m_poll);
}

std::map<std::string, Found> Browser::found() const {
    const std::lock_guard lock(m_mutex);
    return m_found;
}

bool Browser::waitForAddress(const std::string& name, const std::string& address, std::chrono::milliseconds deadline) {
    avahi_threaded_poll_lock(m_poll);
    AvahiKey* key = avahi_key_new(found()[name].host.c_str(), AVAHI_DNS_CLASS_IN, AVAHI_DNS_TYPE_A);
    const auto onRecord = [](AvahiSRecordBrowser*, AvahiIfIndex, AvahiProtocol, AvahiBrowserEvent event,
                             AvahiRecord* record, AvahiLookupResultFlags, void* data) {
        if (event == AVAHI_BROWSER_NEW) {
            auto& self = *static_cast<Browser*>(data);
            AvahiAddress seen{};
            seen.proto = AVAHI_PROTO_INET;
            seen.data.ipv4 = record->data.a.address;
            std::array<char, AVAHI_ADDRESS_STR_MAX> shown{};
            const std::lock_guard lock(self.m_mutex);
            self.m_addresses.insert(avahi_address_snprint(shown.data(), shown.size(), &seen));
        }
    };
    avahi_s_record_browser_new(m_server, AVAHI_IF_UNSPEC, AVAHI_PROTO_INET, key, static_cast<AvahiLookupFlags>(0),
                               onRecord, this);
    avahi_key_unref(key);
    avahi_threaded_poll_unlock(m_poll);
    return waitUntil(deadline, [&] {
        const std::lock_guard lock(m_mutex);
        return m_addresses.count(address) != 0;
    });
}

bool Browser::waitFor(const std::string& name, std::chrono::milliseconds deadline) const {
    return waitUntil(deadline, [&] { return found().count(name) != 0; });
}

bool Browser::waitForGone(const std::string& name, std::chrono::milliseconds deadline) const {
    return waitUntil(deadline, [&] { return found().count(name) == 0; });
}

} // namespace qivo::test
