"""Small defects put into the daemon on purpose: do the tests find them?"""
