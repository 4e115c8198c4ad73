"""Drawings: inline SVG, the same for files and for the page.

Each function returns one ``<svg>`` as markup that a template takes as it is; every text in it is
escaped. There is no style in it, inline or embedded: colours are attributes, which a style sheet
overrules by the classes. Nothing is told by a colour alone. ``.drawing { max-width: 100%; height:
auto; }`` fits it into a narrow page.
"""
