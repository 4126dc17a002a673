# TAVREL_BUILD_DAY: the day of this configuration, in days since 1970-01-01. A clock that shows an
# earlier day is wrong. SOURCE_DATE_EPOCH takes precedence if set.
string(TIMESTAMP seconds "%s" UTC)
math(EXPR TAVREL_BUILD_DAY "${seconds} / 86400")
