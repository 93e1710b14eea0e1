# The steering half of the runtime: ONVIF over HTTP.
pkg_check_modules(STEERING REQUIRED IMPORTED_TARGET libsoup-3.0 libxml-2.0)
add_library(qivo_runtime_steering STATIC
    BackgroundThreads.cpp BackgroundThreads.h
    OnvifLogin.cpp OnvifLogin.h
    OnvifMessages.cpp OnvifMessages.h
    OnvifProbe.cpp OnvifProbe.h
    OnvifReplies.cpp OnvifReplies.h
    PresetTable.cpp PresetTable.h
    PtzCommands.cpp PtzCommands.h
    SoapClient.cpp SoapClient.h
    SoapMessage.cpp SoapMessage.h
    SoapReply.cpp SoapReply.h
    Steering.cpp Steering.h
    SteeringExit.cpp SteeringExit.h
    SteeringTarget.cpp SteeringTarget.h
    Target.cpp Target.h
    UrlParts.cpp UrlParts.h)
target_link_libraries(qivo_runtime_steering PUBLIC qivo_interface qivo_runtime_finder qivo_runtime_log Threads::Threads
                      PRIVATE PkgConfig::STEERING PkgConfig::GSTREAMER)
