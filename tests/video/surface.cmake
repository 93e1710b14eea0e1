# Surfaces against memory that says what the test wants, and against the real one.
qivo_test(test-surface-calls SOURCES S2dcpyTest.cpp IOSurface2DCallsTest.cpp FakeSurface.cpp FakeSurface.h
          LIBRARIES qivo_surface)
qivo_test(test-surface SOURCES IOSurface2DTest.cpp
          LIBRARIES qivo_surface qivo_platform_image qivo_platform_base Qt6::Gui)

# Picture files, compared with what the formats' own libraries read.
find_package(PNG REQUIRED)
find_package(TIFF REQUIRED)
find_package(JPEG REQUIRED)
qivo_test(test-surface-pictures SOURCES SurfacePicturesTest.cpp PictureFiles.cpp PictureFiles.h
          LIBRARIES qivo_surface qivo_platform_base PNG::PNG TIFF::TIFF JPEG::JPEG)
