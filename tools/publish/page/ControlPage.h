#pragma once

#include "tools/publish/Camera.h"
#include "tools/publish/HttpServer.h"
#include "tools/publish/Login.h"
#include "tools/publish/page/JsonObject.h"
#include "tools/publish/page/PagePictures.h"

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>

namespace qivo {

/** What a control page is about. */
struct PageSubject {
    std::string path;        ///< of the page, from "/" to "/"
    std::string machineName; ///< at which browsers may reach it, beside addresses
    std::string name;        ///< "MACHINE (SOURCE)"
    std::string stream;      ///< what is served, in words for people
    std::shared_ptr<Camera> camera;
    PictureFormat format; ///< of the page's pictures, in JPEG's colours
    MakePictures makePictures;
    std::function<int()> streamViewers; ///< who watches over RTSP now
};

/** A source's web page: the live picture, its state, and commands to its camera.
 *
 *  Under the subject's path: "" (the page), "page.js", "page.css", "picture.jpg", "state" and, by POST, "command". All
 *  want the login, if there is one, and that the request names this machine; commands come from the page itself only.
 *
 *  Lives on the thread of the default main context, as long as the HTTP server serves. */
class ControlPage {
  public:
    /** A movement that the page does not renew ends by itself. */
    static constexpr std::chrono::milliseconds movementTime{1000};

    /** A page that has not asked for a picture for so long is no viewer any more. */
    static constexpr std::chrono::milliseconds viewerTime{3000};

    static constexpr std::size_t maximumPages = 64;
    static constexpr std::size_t maximumPageNameBytes = 32;
    static constexpr int pagePresets = 9;

    ControlPage(HttpServer& http, PageSubject subject, std::shared_ptr<HttpLogin> login);
    ControlPage(const ControlPage&) = delete;
    ControlPage& operator=(const ControlPage&) = delete;

    /** Those who watch over RTSP and on pages. */
    [[nodiscard]] int viewers();

    /** Whether pictures are encoded for pages. */
    [[nodiscard]] bool encoding() const { return m_pictures.working(); }

  private:
    struct Page {
        std::chrono::steady_clock::time_point looked;
        double order = 0; // of its last command
    };

    void serve(HttpServer& http, const std::string& method, const std::string& name, HttpHandler handler);
    void sendPicture(const HttpRequest& request, HttpReply reply);
    [[nodiscard]] std::string state();
    [[nodiscard]] HttpResponse command(const HttpRequest& request);
    [[nodiscard]] bool obey(const std::string& verb, const JsonObject& object);
    [[nodiscard]] bool move(const JsonObject& object);
    [[nodiscard]] bool inOrder(const JsonObject& object);
    [[nodiscard]] Page* pageOf(const std::string& name);

    const PageSubject m_subject;
    const std::shared_ptr<HttpLogin> m_login;
    PagePictures m_pictures;
    std::map<std::string, Page> m_pages; // by the names that they gave themselves
};

/** A text in HTML, in elements and quoted attributes. */
[[nodiscard]] std::string htmlText(std::string_view text);

/** The value of a parameter in a query, as it stands; empty if there is none. */
[[nodiscard]] std::string queryValue(const std::string& query, const std::string& name);

} // namespace qivo
