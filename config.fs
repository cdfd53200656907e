# The service's own user and group. The device tree adds this file to TARGET_FS_CONFIG_GEN.
[AID_VENDOR_VYRSERVICE]
value: 2950
