# SPDX-License-Identifier: Apache-2.0
"""The tables. A change here comes with a file in migrations/versions; a test compares the two."""
import sqlalchemy as sa

METADATA = sa.MetaData()

# A code of a host that is in one of these has not been used up.
ISSUED = "issued"
CLAIMED = "claimed"  # somebody is making the account, or was when it ended
MADE = "made"        # the account is there, and the host has not said that it knows
OPEN = (ISSUED, CLAIMED, MADE)

# And here it has.
USED = "used"
REVOKED = "revoked"
REPLACED = "replaced"
LAPSED = "lapsed"    # out of time

# As it stands in the index: databases use that only where they see the same words, and no
# parameters.
IS_OPEN = "state IN ('issued', 'claimed', 'made')"

# SQLite numbers rows by itself in a column of this type alone.
NUMBER = sa.BigInteger().with_variant(sa.Integer, "sqlite")

CODES = sa.Table(
    "codes", METADATA,
    sa.Column("id", NUMBER, primary_key=True, autoincrement=True),
    sa.Column("host", sa.String(15), nullable=False),  # in capitals
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
    # Who is making the account, until when nobody else may, and until when the host that the
    # claim is for finds it again.
    sa.Column("claim", sa.String(64)),
    sa.Column("claim_until", sa.Float(53)),
    sa.Column("found_until", sa.Float(53)),
    sa.Column("host_key", sa.String(64)),  # a digest
    sa.Column("address", sa.String(64)),
    sa.Index("codes_open_host", "host", unique=True,
             sqlite_where=sa.text(IS_OPEN), postgresql_where=sa.text(IS_OPEN)),
    sa.Index("codes_claim", "claim", unique=True),
    sa.Index("codes_state", "state", "id"),
    sa.Index("codes_state_changed", "state", "changed_at"),
)

AUDIT = sa.Table(
    "audit", METADATA,
    sa.Column("id", NUMBER, primary_key=True, autoincrement=True),
    sa.Column("at", sa.Float(53), nullable=False),
    sa.Column("actor", sa.Text, nullable=False),
    sa.Column("action", sa.String(32), nullable=False),
    sa.Column("host", sa.String(15)),
    sa.Column("address", sa.String(64)),
    sa.Column("outcome", sa.Text, nullable=False),
    sa.Index("audit_at", "at"),
)
