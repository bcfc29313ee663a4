"""The providers of the stage.

Each says in `setups` which sign-ins it can be set up for: the sign-in's title, the device's
profile, and the provider's method that registers a client and returns the URLs of its endpoints.
"""

BOTH = {"azure": ("azure", "add_azure"), "websphere": ("websphere", "add_websphere")}
