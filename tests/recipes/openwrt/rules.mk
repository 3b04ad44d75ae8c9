# Plays OpenWrt: BUILD is a folder of the check's own, BUILD/installed holds what
# the build installed, and each package's files go to BUILD/packages/NAME.
INCLUDE_DIR := $(TOPDIR)/include
INSTALL_DIR := install -d -m0755
CP := cp -fpR
TAR := tar
PKG_BUILD_DIR := $(BUILD)/source
PKG_INSTALL_DIR := $(BUILD)/installed
CMAKE_OPTIONS :=
