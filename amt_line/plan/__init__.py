"""Test plans: the file, its schema, its values and its flow. Nothing here touches a port."""
