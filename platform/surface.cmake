# Pixels that processes share: the system alone.
add_library(qivo_platform_surface STATIC FileDescriptor.h DmaBuf.cpp DmaBuf.h Surface.cpp Surface.h SurfaceLayout.cpp SurfaceLayout.h
                                         SurfaceMemory.cpp SurfaceMemory.h SurfaceTransfer.cpp)
target_link_libraries(qivo_platform_surface PUBLIC qivo_options Threads::Threads)
