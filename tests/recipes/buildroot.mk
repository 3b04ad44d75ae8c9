# Plays Buildroot: what its rules would do with the variables of a package is
# said instead.
define cmake-package
all:
	@echo 'DEPENDENCIES $(KELDOAUTH_DEPENDENCIES)'
	@echo 'OPTIONS $(KELDOAUTH_CONF_OPTS)'
	@test -e '$(KELDOAUTH_SITE)/CMakeLists.txt' -a -e '$(KELDOAUTH_SITE)/$(KELDOAUTH_LICENSE_FILES)'
endef
include $(BR2_EXTERNAL_KELDOAUTH_PATH)/external.mk
