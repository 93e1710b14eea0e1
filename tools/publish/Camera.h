#pragma once

#include <array>
#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

namespace qivo {

/** A direction, or the speed of turning: positive is right and up. */
struct PanTilt {
    double pan = 0;  ///< -1 left to 1 right
    double tilt = 0; ///< -1 down to 1 up

    friend bool operator==(const PanTilt&, const PanTilt&) = default;
};

/** Where a camera looks. */
struct CameraPosition {
    PanTilt direction;
    double zoom = 0; ///< 0 wide to 1 near

    friend bool operator==(const CameraPosition&, const CameraPosition&) = default;
};

/** A camera at one moment. */
struct CameraState {
    CameraPosition position;
    bool turning = false; ///< it pans or tilts
    bool zooming = false;
    double focus = 0; ///< 0 near to 1 far
    bool focusing = false;
    bool automaticFocus = true;

    friend bool operator==(const CameraState&, const CameraState&) = default;
};

/** A position kept under a token. */
struct CameraPreset {
    std::string name;
    CameraPosition position;
};

/** A virtual camera: it turns, zooms and focuses smoothly, at the speed that it is told, within its limits. Nothing
 *  ticks: where it stands follows from the last commands and the time.
 *
 *  Every number is checked: a speed or position that is no number or out of its range is refused (false), and the
 *  camera goes on as before. The newest command for an axis replaces what that axis was doing, whoever gave it.
 *
 *  Presets have tokens from "1" to "64", so that a preset number is its token; they are shared by all who steer.
 *
 *  Thread-safe. */
class Camera {
  public:
    using Time = std::chrono::steady_clock::time_point;
    using Clock = std::function<Time()>;

    /** Units a second at full speed. */
    static constexpr double turnRate = 0.5;
    static constexpr double zoomRate = 0.5;
    static constexpr double focusRate = 0.5;

    /** How long a movement lasts that came without a time-out, and the longest time-out. */
    static constexpr std::chrono::milliseconds defaultTimeout{5000};
    static constexpr std::chrono::milliseconds maximumTimeout{60000};

    static constexpr int maximumPresets = 64;
    static constexpr std::size_t maximumPresetNameBytes = 64;

    /** The focus at which everything is sharp; the automatic finds it. */
    static constexpr double sharpFocus = 0.5;

    /** Stands in the middle, zoomed out, in automatic focus. */
    explicit Camera(Clock clock = std::chrono::steady_clock::now);
    Camera(const Camera&) = delete;
    Camera& operator=(const Camera&) = delete;

    [[nodiscard]] CameraState state() const;

    /** Turns and zooms at speeds from -1 to 1 until the time-out (0 to maximumTimeout), a stop or the limit. What is
     *  not given goes on as it was. */
    bool move(std::optional<PanTilt> turn, std::optional<double> zoom,
              std::chrono::milliseconds timeout = defaultTimeout);

    void stop(bool turn = true, bool zoom = true);

    /** Goes to a position, at speeds from 0 to 1 in pan, tilt and zoom; a speed of 0 means the slowest, not none. */
    bool moveTo(std::optional<PanTilt> direction, std::optional<double> zoom, PanTilt turnSpeed = {1, 1},
                double zoomSpeed = 1);

    /** Goes on by a step of -2 to 2 from where it stands (zoom: -1 to 1), at most to the limit. */
    bool moveBy(std::optional<PanTilt> step, std::optional<double> zoom, PanTilt turnSpeed = {1, 1},
                double zoomSpeed = 1);

    /** Manual focus, at 0 (near) to 1 (far). It glides there. */
    bool setFocus(double focus);

    /** Manual focus, changing at a speed from -1 (nearer) to 1 until stopFocus() or the limit. */
    bool moveFocus(double speed);

    void stopFocus();

    /** On: goes to what is sharp and stays there. Off: stays where it is. */
    void setAutomaticFocus(bool automatic);

    /** True for "1" to "64", written as people do. */
    [[nodiscard]] static bool isPresetToken(const std::string& token);

    /** Keeps the present position under a token "1" to "64"; replaces one that is there. An empty name leaves that of a
     *  preset that is there, or makes "Preset N". False: no such token, or the name is not UTF-8, too long or
     *  another's. */
    bool storePreset(const std::string& token, const std::string& name = {});

    /** The token for a new preset: the number that the name is, or ends with after a blank ("QIVO 3"), where that is
     *  free, since people call presets by number; else the lowest free. Empty if all are taken. */
    [[nodiscard]] std::string freePreset(const std::string& name = {}) const;

    /** Goes to a preset at a speed from 0 to 1, as moveTo() does. False: there is none, or no such speed. */
    bool recallPreset(const std::string& token, double speed = 1);

    bool removePreset(const std::string& token);

    /** By number. */
    [[nodiscard]] std::map<int, CameraPreset> presets() const;

    /** Grows with every command and every preset that changes something. */
    [[nodiscard]] std::uint64_t serial() const;

  private:
    enum AxisName : std::size_t { panAxis, tiltAxis, zoomAxis, focusAxis };

    // One thing that moves.
    struct Axis {
        double minimum;
        double maximum;
        double rate;                       // units a second at full speed
        double position;                   // at m_at
        double speed = 0;                  // -1 to 1
        std::optional<double> target = {}; // stands once it is there
        std::optional<Time> until = {};    // stands from then on
        void advance(Time from, Time to);
        void stand();
        void run(double newSpeed, std::optional<Time> end);
        void go(double destination, double newSpeed);
    };

    // All under m_mutex.
    void advance() const;
    void go(const std::optional<PanTilt>& direction, std::optional<double> zoom, PanTilt turnSpeed, double zoomSpeed);

    const Clock m_clock;
    mutable std::mutex m_mutex;
    mutable std::array<Axis, 4> m_axes;    // under m_mutex; by AxisName
    mutable Time m_at;                     // under m_mutex; the moment for which m_axes holds
    bool m_automaticFocus = true;          // under m_mutex
    std::map<int, CameraPreset> m_presets; // under m_mutex
    std::uint64_t m_serial = 0;            // under m_mutex
};

/** A camera of this process, and what those who steer it call it. */
struct SteeredSource {
    std::size_t number = 0; ///< of the source, counted from 0
    std::string name;       ///< "MACHINE (SOURCE)"
    std::shared_ptr<Camera> camera;
};

} // namespace qivo
