# SPDX-License-Identifier: MIT
################################################################################
#
# arrayctl
#
################################################################################

# The archive that packaging/make-archive writes, beside this file.
ARRAYCTL_VERSION = 1.0.0
ARRAYCTL_SOURCE = arrayctl-$(ARRAYCTL_VERSION).tar.gz
ARRAYCTL_SITE = $(ARRAYCTL_PKGDIR)
ARRAYCTL_SITE_METHOD = file
ARRAYCTL_LICENSE = MIT
ARRAYCTL_LICENSE_FILES = LICENSE
ARRAYCTL_CONF_OPTS = -DARRAYCTL_BUILD_TESTS=OFF -DARRAYCTL_BUILD_PLATFORM=OFF -DARRAYCTL_BUILD_REHEARSAL=OFF

ifeq ($(BR2_PACKAGE_ARRAYCTL_STATIC),y)
ARRAYCTL_CONF_OPTS += -DARRAYCTL_STATIC=ON
endif

$(eval $(cmake-package))
