# Pictures that are drawn into memory.
add_library(qivo_platform_drawing STATIC CGBitmapContext.cpp CGBitmapContext.h CGImage.cpp CGImage.h)
target_link_libraries(qivo_platform_drawing PUBLIC qivo_options PRIVATE qivo_platform_image)
