# Log, resources and files: QtCore at most, and none of it in the headers.
add_library(qivo_platform_base STATIC Log.cpp Log.h Resources.cpp Resources.h LocalFile.cpp LocalFile.h FileDescriptor.h)
target_link_libraries(qivo_platform_base PUBLIC qivo_options PRIVATE Qt6::Core)

add_library(qivo_platform_image STATIC Image.cpp ImageDecoding.cpp Image.h Geometry.h)
target_link_libraries(qivo_platform_image PUBLIC qivo_options PRIVATE qivo_platform_base Qt6::Gui)
