include $(sort $(wildcard $(BR2_EXTERNAL_KELDOAUTH_PATH)/package/*/*.mk))
