#include "tools/publish/Publisher.h"

#include "tools/publish/CameraPicture.h"
#include "tools/publish/Input.h"
#include "tools/publish/LocalAddresses.h"
#include "tools/publish/Names.h"

#include <algorithm>
#include <cstdio>
#include <set>

namespace qivo {
namespace {

void say(const std::string& text) {
    std::fprintf(stderr, "qivo-publish: %s\n", text.c_str());
}

PictureFormat formatOf(PictureSize size, PictureRate rate, Codec codec) {
    return {size, rate, codec == Codec::mjpeg ? jpegColours : colourSpaceFor(size.height)};
}

// Where each source's pictures come from: the test picture where there is no input.
MakePictures testPictures(const PictureFormat& format, const TestPictureLook& look) {
    return [format, look] { return std::make_unique<DrawnPictureSource>(format, drawTestPicture(format, look)); };
}

MakePictures cameraPictures(const PictureFormat& format, const CameraPicture::Look& look,
                            const std::shared_ptr<const Camera>& camera) {
    return [format, look, camera] {
        const auto picture = std::make_shared<CameraPicture>(format.size, format.space, look, camera);
        return std::make_unique<DrawnPictureSource>(
            format, [picture](const PicturePlanes& planes, std::chrono::system_clock::time_point time) {
                picture->draw(planes, time);
            });
    };
}

MakePictures inputPictures(const std::shared_ptr<Input>& input, Input::Branch branch, const TestPictureLook& look) {
    return [input, branch, look] { return Input::watch(input, branch, look); };
}

// A page shows what fits well on a screen beside its buttons.
PictureSize pageSizeFor(PictureSize size) {
    constexpr int widest = 960;
    if (size.width <= widest) {
        return size;
    }
    return {widest, std::max(minimumPictureHeight, size.height * widest / size.width & ~1)};
}

PictureRate pageRateFor(PictureRate rate) {
    constexpr int enough = 15;
    return rate.numerator <= enough * rate.denominator ? rate : PictureRate{enough, 1};
}

// What is heard in a source's streams: its tone, or its input's sound; nothing where there is none.
std::optional<StreamSound> soundOf(const SourceOptions& source, std::size_t number, const InputPlace& place,
                                   const std::shared_ptr<Input>& input, Input::Branch branch) {
    if (!source.audio || (input && !place.sound)) {
        return std::nullopt;
    }
    const SoundFormat format{source.audioRate, source.audioChannels};
    if (input) {
        return StreamSound{format, source.audioCodec, [input, branch] { return Input::listen(input, branch); }};
    }
    return StreamSound{format, source.audioCodec,
                       [format, number] { return std::make_unique<ToneSource>(format, number); }};
}

std::string missingElement(const std::vector<SourceOptions>& sources) {
    for (const SourceOptions& source : sources) {
        std::vector<NeededElement> elements = elementsFor(source.codec);
        if (!source.input.empty()) {
            const auto more = elementsFor(placeOf(source.input).kind);
            elements.insert(elements.end(), more.begin(), more.end());
        }
        if (source.ptz) {
            elements.push_back({"jpegenc", "gstreamer1.0-plugins-good"});
        }
        if (source.audio) {
            const auto more = elementsFor(source.audioCodec);
            elements.insert(elements.end(), more.begin(), more.end());
        }
        for (const NeededElement& element : elements) {
            const Object<GstElementFactory> factory(gst_element_factory_find(element.name));
            if (!factory) {
                return std::string("the GStreamer element ") + element.name +
                       " is missing; install the Debian package " + element.package;
            }
        }
    }
    return {};
}

} // namespace

std::string fullPath(std::size_t number) {
    return "/source-" + std::to_string(number + 1);
}

std::string lowPath(std::size_t number) {
    return fullPath(number) + "/low";
}

std::string webPath(std::size_t number) {
    return fullPath(number) + "/";
}

std::string onvifPath(std::size_t number) {
    return fullPath(number) + "/onvif/device_service";
}

Publisher::Publisher(Options options) : m_options(std::move(options)) {}

Publisher::~Publisher() = default;

std::string Publisher::examine() {
    if (std::string problem = missingElement(m_options.sources); !problem.empty()) {
        return problem;
    }
    return findInputs();
}

std::string Publisher::start() {
    if (m_options.login) {
        m_login = std::make_shared<HttpLogin>(*m_options.login);
        m_server.requireLogin(*m_options.login);
    }
    makeCameras();
    mountSources();
    if (std::string problem = m_server.listen(m_options.port, m_options.loopbackOnly); !problem.empty()) {
        return problem;
    }
    if (std::string problem = serveSteering(); !problem.empty()) {
        return problem;
    }
    m_host = m_options.loopbackOnly ? "127.0.0.1" : reachableAddress();
    // Before the addresses are told: who has read them may look for cameras and find them.
    if (const std::string problem = m_onvif ? m_onvif->announce(m_options.loopbackOnly) : ""; !problem.empty()) {
        say(problem + "; they can be steered all the same");
    }
    printAddresses();
    announce();
    return {};
}

std::string Publisher::findInputs() {
    for (const SourceOptions& source : m_options.sources) {
        m_places.push_back(placeOf(source.input));
        if (source.input.empty()) {
            continue;
        }
        if (std::string problem = inputProblem(m_places.back()); !problem.empty()) {
            return problem;
        }
    }
    return {};
}

void Publisher::makeCameras() {
    for (const SourceOptions& source : m_options.sources) {
        m_cameras.push_back(source.ptz ? std::make_shared<Camera>() : nullptr);
    }
}

// Of a source without an input.
MakePictures Publisher::picturesOf(std::size_t number, const PictureFormat& format) const {
    const std::string& name = m_options.sources[number].name;
    return m_cameras[number] ? cameraPictures(format, {name, number}, m_cameras[number])
                             : testPictures(format, {name, {}, number, {}});
}

std::string Publisher::serveSteering() {
    if (std::none_of(m_cameras.begin(), m_cameras.end(), [](const auto& camera) { return camera != nullptr; })) {
        return {};
    }
    std::vector<OnvifCamera> cameras;
    for (std::size_t i = 0; i < m_cameras.size(); ++i) {
        if (m_cameras[i]) {
            cameras.push_back(onvifCamera(i));
            m_pages.push_back(std::make_unique<ControlPage>(m_http, pageSubject(i), m_login));
        }
    }
    m_onvif = std::make_unique<OnvifServer>(m_http, std::move(cameras), m_login);
    return m_http.listen(m_options.httpPort, preferredHttpPort, m_options.loopbackOnly);
}

OnvifCamera Publisher::onvifCamera(std::size_t number) const {
    const SourceOptions& source = m_options.sources[number];
    const PictureFormat full = formatOf(source.size, source.rate, source.codec);
    const PictureFormat low = formatOf(source.lowSize, source.lowRate, source.codec);
    const std::string service = onvifPath(number);
    return {m_options.machine,
            source.name,
            service.substr(0, service.rfind('/') + 1),
            m_cameras[number],
            {{"full", "Full", fullPath(number), full.size, full.rate, source.codec, bitRateFor(full)},
             {"low", "Low bandwidth", lowPath(number), low.size, low.rate, source.codec, bitRateFor(low)}},
            m_server.port()};
}

PageSubject Publisher::pageSubject(std::size_t number) const {
    const SourceOptions& source = m_options.sources[number];
    const PictureFormat format = formatOf(pageSizeFor(source.size), pageRateFor(source.rate), Codec::mjpeg);
    return {webPath(number),
            m_options.machine,
            instanceName(m_options.machine, source.name),
            std::to_string(source.size.width) + " × " + std::to_string(source.size.height),
            m_cameras[number],
            format,
            picturesOf(number, format),
            [this, number] { return m_server.viewers(fullPath(number)) + m_server.viewers(lowPath(number)); }};
}

void Publisher::mountSources() {
    for (std::size_t i = 0; i < m_options.sources.size(); ++i) {
        const SourceOptions& source = m_options.sources[i];
        const TestPictureLook look{source.name, {}, i, {}};
        const PictureFormat full = formatOf(source.size, source.rate, source.codec);
        const PictureFormat low = formatOf(source.lowSize, source.lowRate, source.codec);
        MakePictures fullPictures = picturesOf(i, full);
        MakePictures lowPictures = picturesOf(i, low);
        std::shared_ptr<Input> input;
        if (!source.input.empty()) {
            const auto sound =
                source.audio ? std::optional(SoundFormat{source.audioRate, source.audioChannels}) : std::nullopt;
            input = std::make_shared<Input>(m_places[i], full, low, sound, say);
            fullPictures = inputPictures(input, Input::Branch::full, look);
            lowPictures = inputPictures(input, Input::Branch::low, look);
        }
        m_server.mount(fullPath(i), makeStreamFactory(full, source.codec, std::move(fullPictures),
                                                      soundOf(source, i, m_places[i], input, Input::Branch::full)));
        m_server.mount(lowPath(i), makeStreamFactory(low, source.codec, std::move(lowPictures),
                                                     soundOf(source, i, m_places[i], input, Input::Branch::low)));
    }
}

std::string Publisher::httpAddress(const std::string& path) const {
    return "http://" + m_host + ":" + std::to_string(m_http.port()) + path;
}

std::string Publisher::webAddress(std::size_t number) const {
    const std::string& given = m_options.sources[number].web;
    return given.empty() && m_cameras[number] ? httpAddress(webPath(number)) : given;
}

void Publisher::printAddresses() const {
    const std::string start = "rtsp://" + m_host + ":" + std::to_string(m_server.port());
    for (std::size_t i = 0; i < m_options.sources.size(); ++i) {
        const std::string name = instanceName(m_options.machine, m_options.sources[i].name);
        std::printf("%s%s  %s\n", start.c_str(), fullPath(i).c_str(), name.c_str());
        std::printf("%s%s  %s, low bandwidth\n", start.c_str(), lowPath(i).c_str(), name.c_str());
        if (m_cameras[i]) {
            std::printf("%s  %s, control page\n", webAddress(i).c_str(), name.c_str());
            std::printf("%s  %s, ONVIF\n", httpAddress(onvifPath(i)).c_str(), name.c_str());
        }
    }
    std::fflush(stdout);
}

void Publisher::announce() {
    std::vector<Announcement> announcements;
    for (std::size_t i = 0; i < m_options.sources.size(); ++i) {
        const SourceOptions& source = m_options.sources[i];
        const std::string port = ":" + std::to_string(m_http.port());
        announcements.push_back({m_options.machine, source.name, fullPath(i), lowPath(i),
                                 source.web.empty() && m_cameras[i] ? port + webPath(i) : source.web,
                                 m_cameras[i] ? port + onvifPath(i) : ""});
    }
    m_announcer = std::make_unique<Announcer>(std::move(announcements), static_cast<std::uint16_t>(m_server.port()),
                                              m_options.loopbackOnly, say);
    if (const std::string problem = m_announcer->start(); !problem.empty()) {
        say(problem + "; the addresses above are served all the same");
    }
}

void Publisher::stop() {
    m_announcer.reset();
    m_onvif.reset();
    m_http.stop();
    m_pages.clear();
    m_server.stop();
}

} // namespace qivo
