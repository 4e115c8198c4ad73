"""How alembic reaches the database: by the connection that the store hands it."""

from alembic import context

from amt_line.store.migrate import VERSION_TABLE

context.configure(connection=context.config.attributes["connection"],
                  version_table=VERSION_TABLE)
# The store has begun the transaction, and ends it.
context.run_migrations()
