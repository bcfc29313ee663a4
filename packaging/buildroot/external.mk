include $(sort $(wildcard $(BR2_EXTERNAL_SSOCLIENT_PATH)/*/*.mk))
