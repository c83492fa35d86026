rvd_test(agent_tests
  SOURCES unit/agent_alert_test.cpp unit/agent_answer_test.cpp unit/agent_conversation_test.cpp
          unit/agent_input_lines_test.cpp unit/base_hostile_text_test.cpp
  LIBRARIES rvd_terminal_agent hostile_texts util)
