set pagination off
set confirm off
set print pretty off
set print elements 200
break look
run
up
echo == strings\n
print name
print marks
print nothing
print borrowed
print title
print nowhere.text
echo == exceptions\n
print refused
print late
print unknown_host
print foreign
print seen_by_base
print holder
print environment
print CORBA_TIMEOUT::_description
echo == dictionaries\n
print sizes
print locked
echo == locks\n
print lock
print mutex
print recursive
echo == threads\n
print listener._tid
kel threads
kel locals
echo == pollers and streams\n
print poller
print selector
print out
print in
echo == overwritten memory\n
print *(KELDictionary<KELStringWrapper, int>*)scribbled
print *(KELImplPoll*)scribbled
print *(KELostream*)scribbled
print *(CORBA_TRANSIENT*)scribbled
print *(KELRWLock*)scribbled
print *(KELRMutex*)scribbled
print *(CORBA_Environment*)scribbled
print *(CORBA_String_var*)scribbled
print *(KELDebugLogger*)scribbled
print *(KELResource*)scribbled
print *(CORBA_Exception::Description*)scribbled
echo == the rest\n
print counted
print logger
print seen_by_root
print user_seen_by_root
print no_errno
kel exceptions
kill
quit
