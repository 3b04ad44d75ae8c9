define BuildPackage
packages: package-$(1)
package-$(1):
	$$(call Package/$(1)/install,$(BUILD)/packages/$(1))
	@echo '$(1) DEPENDS $$(filter +%,$$(Package/$(1)))'
endef

prepare:
	$(Build/Prepare)
options:
	@echo 'OPTIONS $(CMAKE_OPTIONS)'
