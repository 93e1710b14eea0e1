#pragma once

#include "tools/publish/Announcer.h"
#include "tools/publish/Camera.h"
#include "tools/publish/HttpServer.h"
#include "tools/publish/Input.h"
#include "tools/publish/Options.h"
#include "tools/publish/RtspServer.h"
#include "tools/publish/onvif/OnvifServer.h"
#include "tools/publish/page/ControlPage.h"

#include <memory>
#include <string>
#include <vector>

namespace qivo {

/** Serves and announces every source that the options ask for. Lives on the thread of the default main context, which
 *  must run for it to serve. */
class Publisher {
  public:
    explicit Publisher(Options options);
    ~Publisher();
    Publisher(const Publisher&) = delete;
    Publisher& operator=(const Publisher&) = delete;

    /** Checks that everything is there; comes before start() and takes up to ten seconds for each input. Empty, or one
     * line that says what is in the way. */
    [[nodiscard]] std::string examine();

    /** Begins to serve, prints the addresses on standard output, then announces. Empty, or one line that says what is
     * in the way; then nothing has begun. */
    [[nodiscard]] std::string start();

    /** Says goodbye to the network and to the viewers. */
    void stop();

  private:
    [[nodiscard]] std::string findInputs();
    void makeCameras();
    void mountSources();
    [[nodiscard]] MakePictures picturesOf(std::size_t number, const PictureFormat& format) const;
    [[nodiscard]] std::string serveSteering();
    [[nodiscard]] OnvifCamera onvifCamera(std::size_t number) const;
    [[nodiscard]] PageSubject pageSubject(std::size_t number) const;
    [[nodiscard]] std::string httpAddress(const std::string& path) const;
    [[nodiscard]] std::string webAddress(std::size_t number) const;
    void printAddresses() const;
    void announce();

    Options m_options;
    std::vector<InputPlace> m_places;               // of each source
    std::vector<std::shared_ptr<Camera>> m_cameras; // of each source; null where there is none to steer
    std::string m_host;                             // at which this machine is reached
    std::shared_ptr<HttpLogin> m_login;             // null where none is needed
    RtspServer m_server;
    HttpServer m_http; // listens where there are cameras
    std::unique_ptr<OnvifServer> m_onvif;
    std::vector<std::unique_ptr<ControlPage>> m_pages; // of the cameras
    std::unique_ptr<Announcer> m_announcer;
};

/** The path of a source's full stream: its number, counted from 0, decides. */
[[nodiscard]] std::string fullPath(std::size_t number);

/** The path of its low-bandwidth stream. */
[[nodiscard]] std::string lowPath(std::size_t number);

/** The path of a camera's control page. */
[[nodiscard]] std::string webPath(std::size_t number);

/** The path of a camera's ONVIF device service. */
[[nodiscard]] std::string onvifPath(std::size_t number);

} // namespace qivo
