"""What a station can ask of a handset: the request table and what is made from it, all pure."""
