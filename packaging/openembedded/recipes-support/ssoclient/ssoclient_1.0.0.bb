SUMMARY = "OpenID Connect sign-in for the login programs of embedded devices"
SECTION = "libs"
# The owner has not chosen a licence yet.
LICENSE = "CLOSED"

DEPENDS = "curl openssl jsoncpp boost"

# Made by scripts/release; put it next to this recipe, in "files".
SRC_URI = "file://${BP}.tar.gz"

inherit cmake pkgconfig

PACKAGECONFIG ??= "doctor"
PACKAGECONFIG[doctor] = "-DSSOCLIENT_TOOLS=ON,-DSSOCLIENT_TOOLS=OFF"
PACKAGECONFIG[winbind] = "-DSSOCLIENT_PLATFORM=winbind,-DSSOCLIENT_PLATFORM=reference,samba"

EXTRA_OECMAKE += "-DBUILD_TESTING=OFF"

# The directory of the settings; the files are the device's own.
do_install:append() {
    install -d -m 0755 ${D}${prefix}/qova/etc/ssoclient
}

PACKAGES =+ "${PN}-doctor"
FILES:${PN}-doctor = "${bindir}/ssoclient-doctor"
FILES:${PN} += "${prefix}/qova"
# The library loads libcurl at its first request: nothing derives that.
RDEPENDS:${PN} = "ca-certificates libcurl"
