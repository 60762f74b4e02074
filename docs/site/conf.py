"""How the site is made of the documents. build.sh lays them out and calls this."""

import os

project = "tav"
copyright = "the authors of tav"
version = release = os.environ["TAV_VERSION"]
extensions = ["myst_parser"]
# Headings are linked to as in the repository's own pages.
myst_heading_anchors = 4
# `tav` is a lexer's name to nobody, and code that a lexer cannot read is shown all the same.
suppress_warnings = ["misc.highlighting_failure"]
html_theme = "furo"
html_title = f"tav {version}"
html_static_path = []
html_extra_path = ["extra"] if os.path.isdir(os.path.join(os.path.dirname(os.path.abspath(__file__)), "extra")) else []
html_copy_source = False
html_show_sphinx = False
