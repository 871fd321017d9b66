# Puts the daemon, its client and its policy into a product:
#   $(call inherit-product, external/corvexd/corvexd.mk)

PRODUCT_PACKAGES += corvexd corvexctl

BOARD_PLAT_PRIVATE_SEPOLICY_DIR += $(dir $(lastword $(MAKEFILE_LIST)))packaging/sepolicy
