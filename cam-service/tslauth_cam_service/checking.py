# SPDX-License-Identifier: Apache-2.0
"""Whether what the configuration names is there and fits together."""
import shutil
import ssl
import time

from .configuration import Wrong, require_protected
from .server import certificate_context, expiry
from .store import Store


def check(configuration):
    server, domain = configuration["server"], configuration["domain"]
    try:
        certificate_context(server)
        days = (expiry(server["certificate"]) - time.time()) / 86400
    except (ssl.SSLError, OSError) as error:
        raise Wrong(f"{server['certificate']} with {server['key']}: {error}") from None
    if days <= 0:
        raise Wrong(f"{server['certificate']} has expired")
    require_protected(domain["credentials"])
    if shutil.which(domain["net_program"]) is None:
        raise Wrong(f"there is no program '{domain['net_program']}'")
    store = Store(configuration.database, configuration.state)
    store.open()
    store.close()
    print(f"the configuration is right; the certificate is valid for {days:.0f} more days")
