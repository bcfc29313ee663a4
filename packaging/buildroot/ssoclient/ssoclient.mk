################################################################################
#
# ssoclient
#
################################################################################

SSOCLIENT_VERSION = 1.0.0
SSOCLIENT_SOURCE = ssoclient-$(SSOCLIENT_VERSION).tar.gz
# Made by scripts/release; put it into the download folder.
SSOCLIENT_SITE = $(BR2_EXTERNAL_SSOCLIENT_PATH)/ssoclient/dl
SSOCLIENT_SITE_METHOD = file
# The owner has not chosen a licence yet, so there is no licence file either.
SSOCLIENT_LICENSE = unknown
SSOCLIENT_REDISTRIBUTE = NO
SSOCLIENT_INSTALL_STAGING = YES
SSOCLIENT_DEPENDENCIES = boost host-pkgconf jsoncpp libcurl openssl
SSOCLIENT_CONF_OPTS = -DBUILD_TESTING=OFF

ifeq ($(BR2_PACKAGE_SSOCLIENT_DOCTOR),y)
SSOCLIENT_CONF_OPTS += -DSSOCLIENT_TOOLS=ON
else
SSOCLIENT_CONF_OPTS += -DSSOCLIENT_TOOLS=OFF
endif

# The folder of the settings; the files are the device's own.
define SSOCLIENT_INSTALL_SETTINGS_FOLDER
	$(INSTALL) -d -m 0755 $(TARGET_DIR)/usr/qova/etc/ssoclient
endef
SSOCLIENT_POST_INSTALL_TARGET_HOOKS += SSOCLIENT_INSTALL_SETTINGS_FOLDER

$(eval $(cmake-package))
