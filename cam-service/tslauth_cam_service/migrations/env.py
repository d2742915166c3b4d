# SPDX-License-Identifier: Apache-2.0
"""Runs migrations on the connection that Store hands over, in its transaction."""
from alembic import context

from tslauth_cam_service import schema

context.configure(connection=context.config.attributes["connection"],
                  target_metadata=schema.METADATA)
context.run_migrations()
