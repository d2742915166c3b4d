# SPDX-License-Identifier: Apache-2.0
"""The tables of codes and of what was done with them, which only grows."""
import sqlalchemy as sa
from alembic import op

revision = "0001"
down_revision = None

IS_OPEN = "state IN ('issued', 'claimed', 'made')"
NUMBER = sa.BigInteger().with_variant(sa.Integer, "sqlite")

# What is younger stays, whatever the retention is set to.
KEPT_SECONDS = 30 * 86400

SQLITE = f"""
CREATE TRIGGER audit_is_not_changed BEFORE UPDATE ON audit
BEGIN SELECT RAISE(ABORT, 'the audit table only grows'); END;

CREATE TRIGGER audit_is_not_removed BEFORE DELETE ON audit
WHEN old.at > (julianday('now') - 2440587.5) * 86400 - {KEPT_SECONDS}
BEGIN SELECT RAISE(ABORT, 'the audit table only grows'); END
"""

POSTGRESQL = f"""
CREATE FUNCTION audit_only_grows() RETURNS trigger LANGUAGE plpgsql AS $$
BEGIN
    IF TG_OP = 'DELETE' AND old.at <= extract(epoch FROM clock_timestamp()) - {KEPT_SECONDS} THEN
        RETURN old;
    END IF;
    RAISE EXCEPTION 'the audit table only grows';
END $$;

CREATE TRIGGER audit_only_grows BEFORE UPDATE OR DELETE ON audit
FOR EACH ROW EXECUTE FUNCTION audit_only_grows();

CREATE TRIGGER audit_is_not_emptied BEFORE TRUNCATE ON audit
FOR EACH STATEMENT EXECUTE FUNCTION audit_only_grows()
"""


def upgrade():
    op.create_table(
        "codes",
        sa.Column("id", NUMBER, primary_key=True, autoincrement=True),
        sa.Column("host", sa.String(15), nullable=False),
        sa.Column("salt", sa.String(64), nullable=False),
        sa.Column("digest", sa.String(64), nullable=False),
        sa.Column("unit", sa.Text),
        sa.Column("networks", sa.Text),
        sa.Column("reuse", sa.Boolean, nullable=False),
        sa.Column("issued_at", sa.Float(53), nullable=False),
        sa.Column("expires_at", sa.Float(53), nullable=False),
        sa.Column("issuer", sa.Text, nullable=False),
        sa.Column("state", sa.String(16), nullable=False),
        sa.Column("changed_at", sa.Float(53), nullable=False),
        sa.Column("claim", sa.String(64)),
        sa.Column("claim_until", sa.Float(53)),
        sa.Column("found_until", sa.Float(53)),
        sa.Column("host_key", sa.String(64)),
        sa.Column("address", sa.String(64)))
    op.create_index("codes_open_host", "codes", ["host"], unique=True,
                    sqlite_where=sa.text(IS_OPEN), postgresql_where=sa.text(IS_OPEN))
    op.create_index("codes_claim", "codes", ["claim"], unique=True)
    op.create_index("codes_state", "codes", ["state", "id"])
    op.create_index("codes_state_changed", "codes", ["state", "changed_at"])
    op.create_table(
        "audit",
        sa.Column("id", NUMBER, primary_key=True, autoincrement=True),
        sa.Column("at", sa.Float(53), nullable=False),
        sa.Column("actor", sa.Text, nullable=False),
        sa.Column("action", sa.String(32), nullable=False),
        sa.Column("host", sa.String(15)),
        sa.Column("address", sa.String(64)),
        sa.Column("outcome", sa.Text, nullable=False))
    op.create_index("audit_at", "audit", ["at"])
    triggers = SQLITE if op.get_bind().dialect.name == "sqlite" else POSTGRESQL
    for trigger in triggers.split(";\n\n"):
        op.execute(trigger)
