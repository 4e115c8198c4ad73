"""The main job, shown: a station walks a simulated handset through a production line's requests."""
