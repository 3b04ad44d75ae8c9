################################################################################
#
# keldoauth
#
################################################################################

# Checked by scripts/check recipes: evaluated by GNU make for each choice in
# Config.in, and built with the options that come out. Not run in Buildroot.

KELDOAUTH_VERSION = 1.0.0
KELDOAUTH_SITE = $(BR2_EXTERNAL_KELDOAUTH_PATH)/../..
KELDOAUTH_SITE_METHOD = local
KELDOAUTH_LICENSE = MIT
KELDOAUTH_LICENSE_FILES = LICENSE
KELDOAUTH_INSTALL_STAGING = YES
KELDOAUTH_DEPENDENCIES = host-pkgconf jsoncpp sqlite
KELDOAUTH_CONF_OPTS = \
	-DKELDOAUTH_EXAMPLES=OFF \
	-DKELDOAUTH_SERVICE=OFF

# nettle: its presence decides whether the archive of whole operations is built.
ifeq ($(BR2_PACKAGE_NETTLE),y)
KELDOAUTH_DEPENDENCIES += nettle
endif

ifeq ($(BR2_PACKAGE_KELDOAUTH_TOOLS),y)
KELDOAUTH_DEPENDENCIES += cli11
KELDOAUTH_CONF_OPTS += -DKELDOAUTH_TOOLS=ON
else
KELDOAUTH_CONF_OPTS += -DKELDOAUTH_TOOLS=OFF
endif

ifeq ($(BR2_PACKAGE_KELDOAUTH_STANDIN),y)
KELDOAUTH_CONF_OPTS += -DKELDOAUTH_PLATFORM=standin
else
KELDOAUTH_CONF_OPTS += -DKELDOAUTH_PLATFORM=system
endif

# The state folder is root's alone unless the image says otherwise.
define KELDOAUTH_PERMISSIONS
	/var/packages/Corvane/target/etc d 700 0 0 - - - - -
endef

$(eval $(cmake-package))
