# Checked by scripts/check recipes: read by a reader of assignments, built with
# the options of each PACKAGECONFIG, and what is installed shared out among the
# packages. Not run by bitbake.
SUMMARY = "Storage of an OAuth 2.0 authorisation service"
LICENSE = "MIT"
LIC_FILES_CHKSUM = "file://LICENSE;md5=5b61e226029ae8739e41390d7fcd342b"

inherit cmake pkgconfig externalsrc

# The layer lies in a checkout.
EXTERNALSRC = "${THISDIR}/../../../.."

DEPENDS = "jsoncpp nettle sqlite3"

PACKAGECONFIG ??= "standin tools"
PACKAGECONFIG[standin] = "-DKELDOAUTH_PLATFORM=standin,-DKELDOAUTH_PLATFORM=system"
PACKAGECONFIG[tools] = "-DKELDOAUTH_TOOLS=ON,-DKELDOAUTH_TOOLS=OFF,cli11"

EXTRA_OECMAKE = "-DKELDOAUTH_EXAMPLES=OFF -DKELDOAUTH_SERVICE=OFF"

PACKAGE_BEFORE_PN = "${PN}-standin ${PN}-tools"
FILES:${PN}-standin = "${libdir}/libkeldcore.so ${libdir}/libkeldcgi.so"
FILES:${PN}-tools = "${sbindir}/keldoauth ${datadir}/bash-completion"
FILES:${PN} = "${libdir}/libkeldoauth.so.*"

RRECOMMENDS:${PN} = "${@bb.utils.contains('PACKAGECONFIG', 'standin', '${PN}-standin', '', d)}"
