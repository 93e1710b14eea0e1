#include "tools/publish/page/ControlPage.h"

#include "tools/publish/page/OriginRule.h"
#include "tools/publish/page/PageFiles.h"

#include <algorithm>
#include <charconv>
#include <cmath>

namespace qivo {
namespace {

using Headers = std::vector<std::pair<std::string, std::string>>;

// Nothing from elsewhere, nothing inline, in nobody's frame.
const Headers pageHeaders{{"Content-Security-Policy",
                           "default-src 'none'; script-src 'self'; style-src 'self'; connect-src 'self'; "
                           "img-src 'self' data:; base-uri 'none'; form-action 'none'; frame-ancestors 'none'"},
                          {"X-Frame-Options", "DENY"},
                          {"Referrer-Policy", "same-origin"},
                          {"Cross-Origin-Opener-Policy", "same-origin"},
                          {"Cross-Origin-Resource-Policy", "same-origin"}};

HttpResponse plain(int status, const std::string& text) {
    return {status, "text/plain; charset=utf-8", text + "\n", pageHeaders};
}

std::string withText(std::string page, const std::string& place, const std::string& text) {
    for (std::size_t at = page.find(place); at != std::string::npos; at = page.find(place, at + text.size())) {
        page.replace(at, place.size(), text);
    }
    return page;
}

std::string jsonNumber(double value) {
    return std::to_string(std::round(value * 1e4) / 1e4);
}

const char* jsonTruth(bool value) {
    return value ? "true" : "false";
}

// "1" to "9"; empty for everything else.
std::string presetToken(const JsonObject& object) {
    const auto number = member<double>(object, "preset");
    const bool whole = number && *number >= 1 && *number <= ControlPage::pagePresets && *number == std::floor(*number);
    return whole ? std::to_string(static_cast<int>(*number)) : "";
}

bool isPageName(const std::string& name) {
    return !name.empty() && name.size() <= ControlPage::maximumPageNameBytes &&
           std::all_of(name.begin(), name.end(), [](char byte) { return g_ascii_isalnum(byte) != FALSE; });
}

} // namespace

ControlPage::ControlPage(HttpServer& http, PageSubject subject, std::shared_ptr<HttpLogin> login)
    : m_subject(std::move(subject)), m_login(std::move(login)), m_pictures(m_subject.format, m_subject.makePictures) {
    const auto file = [](const char* type, std::string text) {
        return [response = HttpResponse{200, type, std::move(text), pageHeaders}](const HttpRequest&, HttpReply reply) {
            reply.send(response);
        };
    };
    serve(http, "GET", "",
          file("text/html; charset=utf-8", withText(withText(pageHtml, "{{NAME}}", htmlText(m_subject.name)),
                                                    "{{STREAM}}", htmlText(m_subject.stream))));
    serve(http, "GET", "page.css", file("text/css; charset=utf-8", pageCss));
    serve(http, "GET", "page.js", file("text/javascript; charset=utf-8", pageJs));
    serve(http, "GET", "state", [this](const HttpRequest&, HttpReply reply) {
        reply.send({200, "application/json", state(), pageHeaders});
    });
    serve(http, "GET", "picture.jpg",
          [this](const HttpRequest& request, HttpReply reply) { sendPicture(request, std::move(reply)); });
    serve(http, "POST", "command",
          [this](const HttpRequest& request, HttpReply reply) { reply.send(command(request)); });
}

// The name first: a page that found its way here under another must not even be asked for the login.
void ControlPage::serve(HttpServer& http, const std::string& method, const std::string& name, HttpHandler handler) {
    const bool isPage = name.empty();
    HttpHandler inner = m_login ? m_login->protect(std::move(handler)) : std::move(handler);
    http.route(method, m_subject.path + name, [this, isPage, inner](const HttpRequest& request, HttpReply reply) {
        if (!namesThisMachine(request, m_subject.machineName)) {
            reply.send(plain(421, "This page answers to the machine's address only."));
        } else if (request.method == "POST" ? !mayCommand(request) : !isPage && !mayLook(request)) {
            reply.send(plain(403, "Only the control page itself may do this."));
        } else {
            inner(request, std::move(reply));
        }
    });
}

ControlPage::Page* ControlPage::pageOf(const std::string& name) {
    if (!isPageName(name)) {
        return nullptr;
    }
    const auto now = std::chrono::steady_clock::now();
    if (m_pages.count(name) == 0 && m_pages.size() >= maximumPages) {
        std::erase_if(m_pages, [now](const auto& entry) { return now - entry.second.looked > viewerTime; });
    }
    return m_pages.count(name) != 0 || m_pages.size() < maximumPages ? &m_pages[name] : nullptr;
}

int ControlPage::viewers() {
    const auto now = std::chrono::steady_clock::now();
    return m_subject.streamViewers() +
           static_cast<int>(std::count_if(m_pages.begin(), m_pages.end(), [now](const auto& entry) {
               return now - entry.second.looked <= viewerTime;
           }));
}

void ControlPage::sendPicture(const HttpRequest& request, HttpReply reply) {
    if (Page* page = pageOf(queryValue(request.query, "page"))) {
        page->looked = std::chrono::steady_clock::now();
    }
    const std::string after = queryValue(request.query, "after");
    std::uint64_t last = 0;
    std::from_chars(after.data(), after.data() + after.size(), last);
    const auto shared = std::make_shared<HttpReply>(std::move(reply));
    m_pictures.next(last, [shared](const std::string& jpeg, std::uint64_t number) {
        if (number == 0) {
            shared->send(plain(503, "There is no picture."));
            return;
        }
        HttpResponse response{200, "image/jpeg", jpeg, pageHeaders};
        response.headers.emplace_back("X-Picture", std::to_string(number));
        shared->send(response);
    });
}

std::string ControlPage::state() {
    const CameraState now = m_subject.camera->state();
    std::string presets;
    for (const auto& [number, preset] : m_subject.camera->presets()) {
        presets += (presets.empty() ? "" : ",") + std::to_string(number);
    }
    return "{\"name\":" + jsonText(m_subject.name) + ",\"stream\":" + jsonText(m_subject.stream) +
           ",\"viewers\":" + std::to_string(viewers()) + ",\"pan\":" + jsonNumber(now.position.direction.pan) +
           ",\"tilt\":" + jsonNumber(now.position.direction.tilt) + ",\"zoom\":" + jsonNumber(now.position.zoom) +
           ",\"turning\":" + jsonTruth(now.turning) + ",\"zooming\":" + jsonTruth(now.zooming) +
           ",\"focus\":" + jsonNumber(now.focus) + ",\"focusing\":" + jsonTruth(now.focusing) +
           ",\"automaticFocus\":" + jsonTruth(now.automaticFocus) + ",\"presets\":[" + presets + "]}";
}

HttpResponse ControlPage::command(const HttpRequest& request) {
    const auto object = readJsonObject(request.body);
    const auto verb = object ? member<std::string>(*object, "command") : std::nullopt;
    if (!verb) {
        return plain(400, "This is no command.");
    }
    if (!inOrder(*object)) {
        return plain(409, "A later command was here before.");
    }
    return obey(*verb, *object) ? HttpResponse{204, {}, {}, pageHeaders}
                                : plain(400, "The camera does not know how to do this.");
}

// Each command has a connection of its own, so one may overtake another; a move that comes after its stop must not
// count.
bool ControlPage::inOrder(const JsonObject& object) {
    Page* page = pageOf(member<std::string>(object, "page").value_or(""));
    const auto order = member<double>(object, "order");
    if (page == nullptr || !order) {
        return true;
    }
    const bool later = *order > page->order;
    page->order = std::max(*order, page->order);
    return later;
}

bool ControlPage::obey(const std::string& verb, const JsonObject& object) {
    Camera& camera = *m_subject.camera;
    if (verb == "move") {
        return move(object);
    }
    if (verb == "stop") {
        camera.stop(member<bool>(object, "turn").value_or(true), member<bool>(object, "zoom").value_or(true));
        return true;
    }
    if (verb == "focus") {
        const auto value = member<double>(object, "value");
        return value && camera.setFocus(*value);
    }
    if (verb == "automaticFocus") {
        const auto on = member<bool>(object, "on");
        if (on) {
            camera.setAutomaticFocus(*on);
        }
        return on.has_value();
    }
    if (verb == "store") {
        return camera.storePreset(presetToken(object));
    }
    return verb == "recall" && camera.recallPreset(presetToken(object));
}

bool ControlPage::move(const JsonObject& object) {
    const auto pan = member<double>(object, "pan");
    const auto tilt = member<double>(object, "tilt");
    const auto zoom = member<double>(object, "zoom");
    if (pan.has_value() != tilt.has_value() || (!pan && !zoom)) {
        return false;
    }
    const auto turn = pan ? std::optional(PanTilt{*pan, *tilt}) : std::nullopt;
    return m_subject.camera->move(turn, zoom, movementTime);
}

std::string htmlText(std::string_view text) {
    std::string html;
    for (const char character : text) {
        switch (character) {
        case '&':
            html += "&amp;";
            break;
        case '<':
            html += "&lt;";
            break;
        case '>':
            html += "&gt;";
            break;
        case '"':
            html += "&quot;";
            break;
        case '\'':
            html += "&#39;";
            break;
        default:
            html += character;
        }
    }
    return html;
}

std::string queryValue(const std::string& query, const std::string& name) {
    for (std::size_t begin = 0; begin < query.size();) {
        const std::size_t end = std::min(query.find('&', begin), query.size());
        if (query.compare(begin, name.size() + 1, name + "=") == 0) {
            return query.substr(begin + name.size() + 1, end - begin - name.size() - 1);
        }
        begin = end + 1;
    }
    return {};
}

} // namespace qivo
